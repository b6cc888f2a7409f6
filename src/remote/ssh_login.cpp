#include "remote/ssh_login.h"

#include "common/address.h"
#include "common/debug_log.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/current_job.h"

namespace bakjob
{

std::optional<SshLogin> ssh_login_of(const RsyncJob &job)
{
    if (job.server_type == SERVER_SAME_KIND) return SshLogin::as_client;
    if (job.server_type == SERVER_ANY) return SshLogin::as_user;
    return std::nullopt;
}

std::optional<std::string> ssh_password(const RsyncJob &job)
{
    char encoded[PASSWORD_SIZE] = "";
    if (job.ssh_pwd[0] == '\0') return encoded;
    if (job.pwd_encoded != 0) {
        copy_text(encoded, job.ssh_pwd);
    } else if (password_encode(encoded, job.ssh_pwd, sizeof encoded) < 0) {
        DebugLog("ERROR: ssh_pwd refused: too long\n");
        return std::nullopt;
    }
    if (!is_base64("ssh_pwd", encoded)) return std::nullopt;
    return encoded;
}

std::optional<std::string> ssh_command(const RsyncJob &job, SshLogin login, std::string_view remote_command)
{
    const auto password = ssh_password(job);
    if (!has_whole_texts(job)) return std::nullopt;
    if (!password || job.remote_ip[0] == '\0' || !is_safe_host(job.remote_ip)) return std::nullopt;
    const std::string option = password->empty() ? "" : format_text("-d '%s'", password->c_str());
    const std::string six = *ipv6_flag(job.remote_ip) == '\0' ? "" : "-6 ";
    const std::string host = scoped_host(job.remote_ip);

    std::string command = "/usr/sbin/ssh ";
    if (login == SshLogin::as_client) {
        command += option + ' ' + six + host;
    } else {
        if (!is_safe_ssh_user(job.ssh_user)) return std::nullopt;
        command += six + option + (option.empty() ? "" : " ") + job.ssh_user + '@' + host;
    }
    command += ' ';
    command += remote_command;
    if (!fits_command(command)) {
        DebugLog("ERROR: ssh command refused: too long\n");
        return std::nullopt;
    }
    return command;
}

int rsync_remote_exec(std::string_view command)
{
    const auto ssh = ssh_command(CurrentJob, SshLogin::as_client, command);
    return ssh ? run_shell(*ssh) : -1;
}

} // namespace bakjob
