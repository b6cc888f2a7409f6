#include "remote/ssh_login.h"

#include "common/address.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/current_job.h"

namespace bakjob
{

std::optional<SshLogin> ssh_login_of(const RsyncJob &job)
{
    if (job.server_type == SERVER_SAME_KIND) return SshLogin::AS_CLIENT;
    if (job.server_type == SERVER_ANY) return SshLogin::AS_USER;
    return std::nullopt;
}

Checked ssh_password(const RsyncJob &job)
{
    char encoded[PASSWORD_SIZE] = "";
    if (job.ssh_pwd[0] == '\0') return std::string();
    if (job.pwd_encoded != 0) {
        copy_text(encoded, job.ssh_pwd);
    } else if (password_encode(encoded, job.ssh_pwd, sizeof encoded) < 0) {
        return refused("ssh_pwd", "too long");
    }
    if (Refusal refusal = refusal_of_base64("ssh_pwd", encoded)) return refusal;
    return std::string(encoded);
}

Checked ssh_command(const RsyncJob &job, SshLogin login, std::string_view remote_command)
{
    const Checked password = ssh_password(job);
    if (Refusal refusal = refusal_of_cut_text(job)) return refusal;
    if (!password) return password.refusal();
    if (Refusal refusal = refusal_of_host(job.remote_ip)) return refusal;
    const std::string option = password->empty() ? "" : format_text("-d '%s'", password->c_str());
    const std::string six = *ipv6_flag(job.remote_ip) == '\0' ? "" : "-6 ";
    const std::string host = scoped_host(job.remote_ip);

    std::string command = "/usr/sbin/ssh ";
    if (login == SshLogin::AS_CLIENT) {
        command += option + ' ' + six + host;
    } else {
        if (Refusal refusal = refusal_of_ssh_user(job.ssh_user)) return refusal;
        command += six + option + (option.empty() ? "" : " ") + job.ssh_user + '@' + host;
    }
    command += ' ';
    command += remote_command;
    if (!fits_command(command)) return refused("ssh command", "too long");
    return command;
}

int run_remotely(const RsyncJob &job, std::string_view command)
{
    const Checked ssh = ssh_command(job, SshLogin::AS_CLIENT, command);
    return ssh ? run_shell(*ssh) : -1;
}

int rsync_remote_exec(std::string_view command)
{
    return run_remotely(CurrentJob, command);
}

} // namespace bakjob
