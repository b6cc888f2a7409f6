#include "transfer/rsync_command.h"

#include "common/address.h"
#include "common/debug_log.h"
#include "common/excludes.h"
#include "common/job_files.h"
#include "common/run_options.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/current_job.h"
#include "remote/ssh_login.h"
#include "transfer/row_guard.h"

namespace bakjob
{

namespace
{

// Whether what stands in the command unquoted may stand there.
bool is_safe(const RsyncJob &job)
{
    const bool named = CurrentJob.server_type != SERVER_SAME_KIND;
    const bool daemon_user = named && job.rsync_mode == RSYNC_MODE_DAEMON;
    const bool ssh_user = named && job.use_ssh == 1;
    return has_whole_texts(job) && (job.job_name[0] == '\0' || is_job_name(job.job_name)) &&
           is_safe_host(job.remote_ip) && is_safe_port(job.port) &&
           (!daemon_user || is_safe_rsync_user(job.rsync_user)) &&
           (!ssh_user || is_safe_ssh_user(job.ssh_user));
}

// " -e ..." with the login; nothing when the password has no base64 form. The blanks are part of the format.
std::optional<std::string> remote_shell(const RsyncJob &job)
{
    const auto password = ssh_password(job);
    if (!password) return std::nullopt;
    const bool with_password = CurrentJob.ssh_pwd[0] != '\0';
    const std::string option = with_password ? format_text("-d \"%s\" ", password->c_str()) : "";
    if (CurrentJob.server_type == SERVER_SAME_KIND) {
        return format_text(" -e '/usr/sbin/ssh %s -ax -c blowfish '", option.c_str());
    }
    return format_text(" -e '/usr/sbin/ssh %s-ax -c blowfish -l %s'", option.c_str(), job.ssh_user);
}

const char *deletion(int keep_exist_file)
{
    switch (keep_exist_file) {
    case 1:
        return " --ignore-existing";
    case 2:
        return " ";
    default:
        return " --delete";
    }
}

std::optional<std::string> options(const RsyncJob &job)
{
    std::string text = format_text("/usr/sbin/rsync  --job-name=%s -aHq8%s", shell_word(job.job_name).c_str(),
                                   ipv6_flag(job.remote_ip));
    if (job.use_ssh == 1) {
        const auto shell = remote_shell(job);
        if (!shell) return std::nullopt;
        text += *shell;
    }
    text += deletion(job.keep_exist_file);
    if (job.rsync_timeout > 0) text += format_text(" --timeout=%d ", job.rsync_timeout);
    text += exclude_options(ExcludeForm::TRANSFER);
    if (job.rsync_mode == RSYNC_MODE_DAEMON) {
        if (!shell_path("rsync_pwd_file", job.rsync_pwd_file)) return std::nullopt;
        text += " --password-file=" + in_double_quotes(job.rsync_pwd_file);
    }
    if (std::string(DEFAULT_PORT) != job.port) text += format_text(" --port=%s", job.port);
    return text;
}

// User, host and the colons: everything in front of the remote path.
std::string endpoint(const RsyncJob &job)
{
    const std::string host = bracketed_host(job.remote_ip);
    if (job.rsync_mode != RSYNC_MODE_DAEMON) return host + ':';
    const std::string user = CurrentJob.server_type == SERVER_SAME_KIND ? "root" : job.rsync_user;
    return user + '@' + host + "::";
}

} // namespace

std::optional<std::string> rsync_build_command(const RsyncJob &job)
{
    if (!is_safe(job)) return std::nullopt;
    const auto option_text = options(job);
    const auto remote_path = shell_path_part("remote_path", job.remote_path);
    if (!option_text || !remote_path) return std::nullopt;

    // Only a directory, not a link to one, is copied by its contents.
    const auto names_folder = is_folder(job.local_path);
    if (!names_folder) return std::nullopt;
    const std::string slash = *names_folder ? "/" : "";
    const bool recover = run_options.recover_seq != 0;
    const bool pull = !recover && job.backup_type != BACKUP_PUSH;
    std::string local = job.local_path + slash;
    if (recover) {
        const std::int64_t number = std::int64_t{run_options.recover_seq} - 1;
        local = snapshot_path(job.local_path, job.job_name, number) + '/';
    } else if (job.backup_type == BACKUP_PULL && job.inc_enable == 1) {
        local = snapshot_path(job.local_path, job.job_name, 0);
    }
    const auto local_end = shell_path("local_path", local);
    if (!local_end) return std::nullopt;
    const std::string remote_end = endpoint(job) + *remote_path + (pull ? slash : "");
    if (option_text->size() >= COMMAND_SIZE || remote_end.size() >= PATH_SIZE) {
        DebugLog("ERROR: transfer command refused: too long\n");
        return std::nullopt;
    }
    const std::string &source = pull ? remote_end : *local_end;
    const std::string &destination = pull ? *local_end : remote_end;
    std::string command = *option_text + ' ' + source + ' ' + destination + ' ';
    if (!fits_command(command)) {
        DebugLog("ERROR: transfer command refused: too long\n");
        return std::nullopt;
    }
    return command;
}

} // namespace bakjob
