#include "transfer/rsync_command.h"

#include "common/address.h"
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

// Of what stands in the command unquoted and may not.
Refusal refusal_of_values(const RsyncJob &job, bool named)
{
    if (Refusal refusal = refusal_of_cut_text(job)) return refusal;
    if (job.job_name[0] != '\0' && !is_job_name(job.job_name))
        return refused("job_name", "not allowed as a job's name");
    if (Refusal refusal = refusal_of_host(job.remote_ip)) return refusal;
    if (Refusal refusal = refusal_of_port(job.port)) return refusal;
    if (named && job.rsync_mode == RSYNC_MODE_DAEMON) {
        if (Refusal refusal = refusal_of_rsync_user(job.rsync_user)) return refusal;
    }
    return named && job.use_ssh == 1 ? refusal_of_ssh_user(job.ssh_user) : Refusal();
}

// " -e ..." with the login. The blanks are part of the format.
Checked remote_shell(const RsyncJob &job, const RsyncJob &filled)
{
    const Checked password = ssh_password(job);
    if (!password) return password.refusal();
    const bool with_password = filled.ssh_pwd[0] != '\0';
    const std::string option = with_password ? format_text("-d \"%s\" ", password->c_str()) : "";
    if (filled.server_type == SERVER_SAME_KIND) {
        return format_text(" -e '/usr/sbin/ssh %s -ax -c blowfish '", option.c_str());
    }
    return format_text(" -e '/usr/sbin/ssh %s-ax -c blowfish -l %s'", option.c_str(), job.ssh_user);
}

const char *deletion(int keep_exist_file)
{
    switch (keep_exist_file) {
    case EXISTING_KEEP:
        return " --ignore-existing";
    case EXISTING_UPDATE:
        return " ";
    default:
        return " --delete";
    }
}

Checked options(const RsyncJob &job, const RsyncJob &filled)
{
    std::string text = format_text("/usr/sbin/rsync  --job-name=%s -aHq8%s", shell_word(job.job_name).c_str(),
                                   ipv6_flag(job.remote_ip));
    if (job.use_ssh == 1) {
        const Checked shell = remote_shell(job, filled);
        if (!shell) return shell.refusal();
        text += *shell;
    }
    text += deletion(job.keep_exist_file);
    if (job.rsync_timeout > 0) text += format_text(" --timeout=%d ", job.rsync_timeout);
    text += exclude_options(ExcludeForm::TRANSFER);
    if (job.rsync_mode == RSYNC_MODE_DAEMON) {
        const Checked file = shell_path("rsync_pwd_file", job.rsync_pwd_file);
        if (!file) return file.refusal();
        text += " --password-file=" + in_double_quotes(job.rsync_pwd_file);
    }
    if (std::string(DEFAULT_PORT) != job.port) text += format_text(" --port=%s", job.port);
    return text;
}

// User, host and the colons: everything in front of the remote path.
std::string endpoint(const RsyncJob &job, bool named)
{
    if (job.rsync_mode != RSYNC_MODE_DAEMON) return rsync_address(nullptr, job.remote_ip, Reached::OVER_SSH);
    return rsync_address(named ? job.rsync_user : DEFAULT_USER, job.remote_ip, Reached::BY_DAEMON);
}

} // namespace

Checked transfer_command(const RsyncJob &job, const RsyncJob &filled)
{
    const bool named = filled.server_type != SERVER_SAME_KIND;
    if (Refusal refusal = refusal_of_values(job, named)) return refusal;
    const Checked option_text = options(job, filled);
    if (!option_text) return option_text.refusal();
    const Checked remote_path = shell_path_part("remote_path", job.remote_path);
    if (!remote_path) return remote_path.refusal();

    // Only a directory, not a link to one, is copied by its contents.
    const Place place = look_at(job.local_path);
    if (place.refusal) return place.refusal;
    const std::string slash = place.is_folder ? "/" : "";
    const bool recover = is_recover_run();
    const bool pull = !recover && job.backup_type != BACKUP_PUSH;
    std::string local = job.local_path + slash;
    if (recover) {
        const std::int64_t number = std::int64_t{run_options.recover_seq} - 1;
        local = snapshot_path(job.local_path, job.job_name, number) + '/';
    } else if (keeps_snapshots(job)) {
        local = snapshot_path(job.local_path, job.job_name, 0);
    }
    const Checked local_end = shell_path("local_path", local);
    if (!local_end) return local_end.refusal();
    const std::string remote_end = endpoint(job, named) + *remote_path + (pull ? slash : "");
    if (option_text->size() >= COMMAND_SIZE || remote_end.size() >= PATH_SIZE) {
        return refused("transfer command", "too long");
    }
    const std::string &source = pull ? remote_end : *local_end;
    const std::string &destination = pull ? *local_end : remote_end;
    std::string command = *option_text + ' ' + source + ' ' + destination + ' ';
    if (!fits_command(command)) return refused("transfer command", "too long");
    return command;
}

Checked rsync_build_command(const RsyncJob &job)
{
    return transfer_command(job, CurrentJob);
}

} // namespace bakjob
