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

Checked module_list_command(const RsyncJob &job)
{
    if (Refusal refusal = refusal_of_cut_text(job)) return refusal;
    if (Refusal refusal = refusal_of_host(job.remote_ip)) return refusal;
    return format_text("%s -8%s %s 2>&1", RSYNC, ipv6_flag(job.remote_ip),
                       rsync_address(nullptr, job.remote_ip, Reached::BY_DAEMON).c_str());
}

Checked write_test_command(const RsyncJob &job, int direction)
{
    if (Refusal refusal = refusal_of_cut_text(job)) return refusal;
    if (Refusal refusal = refusal_of_host(job.remote_ip)) return refusal;
    if (Refusal refusal = refusal_of_rsync_user(job.rsync_user)) return refusal;
    const Checked path = shell_path_part("remote_path", job.remote_path);
    if (!path) return path.refusal();

    const bool daemon = job.rsync_mode == RSYNC_MODE_DAEMON;
    const bool pull = job.backup_type == BACKUP_PULL && direction == 0;
    std::string password;
    if (daemon) {
        const auto name = JobName::checked(job.job_name);
        if (!name) return refused("job_name", "not allowed as a job's name");
        password = format_text("--password-file=%s ", in_double_quotes(password_file(*name)).c_str());
    }
    const Reached how = daemon ? Reached::BY_DAEMON : Reached::OVER_SSH;
    const std::string remote = rsync_address(job.rsync_user, job.remote_ip, how) + *path;
    const std::string ends = pull ? remote + " /tmp" : (daemon ? "'/etc/hosts' " : "/etc/hosts ") + remote;
    return format_text("%s -a8%s --dry-run %s%s 2>&1", RSYNC, ipv6_flag(job.remote_ip), password.c_str(),
                       ends.c_str());
}

ProbeReply probe_daemon(const RsyncJob &job)
{
    const Checked command = module_list_command(job);
    if (command) DebugLog("rysnc test cmd--->[%s]\n", command->c_str());
    return ask(command);
}

ProbeReply probe_target(const RsyncJob &job, int direction)
{
    const Checked command = write_test_command(job, direction);
    if (command) DebugLog("rysnc write test cmd--->[%s]\n", command->c_str());
    return ask(command);
}

RemoteReplyCode rsync_daemon_test()
{
    return probe_daemon(CurrentJob).code;
}

RemoteReplyCode rsync_write_test(int direction)
{
    return probe_target(CurrentJob, direction).code;
}

} // namespace bakjob
