#include "remote/daemon_probe.h"

#include "common/address.h"
#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/current_job.h"

namespace bakjob
{

namespace
{

constexpr const char *RSYNC = "/usr/sbin/rsync ";

} // namespace

std::optional<std::string> module_list_command(const RsyncJob &job)
{
    if (!has_whole_texts(job)) return std::nullopt;
    if (job.remote_ip[0] == '\0' || !is_safe_host(job.remote_ip)) return std::nullopt;
    return format_text("%s -8%s %s:: 2>&1", RSYNC, ipv6_flag(job.remote_ip),
                       bracketed_host(job.remote_ip).c_str());
}

std::optional<std::string> write_test_command(const RsyncJob &job, int direction)
{
    if (!has_whole_texts(job)) return std::nullopt;
    if (job.remote_ip[0] == '\0' || !is_safe_host(job.remote_ip)) return std::nullopt;
    if (!is_safe_rsync_user(job.rsync_user)) return std::nullopt;
    const auto path = shell_path_part("remote_path", job.remote_path);
    if (!path) return std::nullopt;

    const bool daemon = job.rsync_mode == RSYNC_MODE_DAEMON;
    const bool pull = job.backup_type == BACKUP_PULL && direction == 0;
    std::string password;
    if (daemon) {
        const auto name = JobName::checked(job.job_name);
        if (!name) return std::nullopt;
        password = format_text("--password-file=%s ", in_double_quotes(password_file(*name)).c_str());
    }
    const std::string remote = format_text("%s@%s%s%s", job.rsync_user, bracketed_host(job.remote_ip).c_str(),
                                           daemon ? "::" : ":", path->c_str());
    const std::string ends = pull ? remote + " /tmp" : (daemon ? "'/etc/hosts' " : "/etc/hosts ") + remote;
    return format_text("%s -a8%s --dry-run %s%s 2>&1", RSYNC, ipv6_flag(job.remote_ip), password.c_str(),
                       ends.c_str());
}

RemoteReplyCode rsync_daemon_test()
{
    const auto command = module_list_command(CurrentJob);
    if (!command) return REPLY_ERROR;
    DebugLog("rysnc test cmd--->[%s]\n", command->c_str());
    return rsync_classify_reply(*command);
}

RemoteReplyCode rsync_write_test(int direction)
{
    const auto command = write_test_command(CurrentJob, direction);
    if (!command) return REPLY_ERROR;
    DebugLog("rysnc write test cmd--->[%s]\n", command->c_str());
    return rsync_classify_reply(*command);
}

} // namespace bakjob
