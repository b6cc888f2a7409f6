#include "remote/ssh_probe.h"

#include "common/address.h"
#include "common/debug_log.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/current_job.h"

#include <array>
#include <string>
#include <unistd.h>

namespace bakjob
{

namespace
{

struct Fragment {
    std::string_view text;
    std::optional<SshTestResult> result; // nullopt: the host key has changed
};

constexpr std::array FRAGMENTS = {
    Fragment{"No route to host", SSH_NO_ROUTE},      Fragment{"Connection refused", SSH_REFUSED},
    Fragment{"Permission denied", SSH_DENIED},       Fragment{"@@@@@@@@@@@@@@@@@@@@@@@@@@@@", std::nullopt},
    Fragment{"Connection timed out", SSH_TIMED_OUT},
};

void forget_host_key(const std::string &remote_ip)
{
    DebugLog("--->##### SERVER SSH key changed!\n");
    run_shell(format_text("/usr/sbin/ssh-keygen -R %s", scoped_host(remote_ip).c_str()));
    // The next login must not meet the old key, not even after a power cut.
    sync();
}

} // namespace

std::optional<SshTestResult> judge_ssh_reply(std::string_view line)
{
    for (const Fragment &fragment : FRAGMENTS) {
        if (contains(line, fragment.text)) return fragment.result;
    }
    return line.empty() ? SSH_FAILED : SSH_OK;
}

Checked ssh_test_command(const RsyncJob &job, SshLogin login)
{
    return ssh_command(job, login, "ls / 2>&1");
}

LoginReply probe_login(const RsyncJob &job)
{
    if (job.remote_ip[0] == '\0') return {SSH_FAILED, refusal_of_host(job.remote_ip).why};
    const auto login = ssh_login_of(job);
    const Checked command = login ? ssh_test_command(job, *login) : NO_SSH_LOGIN;
    DebugLog("ssh_test cmd[%s]\n", command.value_or("").c_str());
    if (!command) return {SSH_FAILED, command.refusal().why};

    auto line = first_reply_line(*command);
    if (!line) return {SSH_FAILED, NOT_STARTED};
    DebugLog("--->[%s]\n", line->c_str());
    auto result = judge_ssh_reply(*line);
    if (result) return {*result, *line};

    forget_host_key(job.remote_ip);
    line = first_reply_line(*command);
    if (!line) return {SSH_FAILED, NOT_STARTED};
    result = judge_ssh_reply(*line);
    return {result.value_or(SSH_FAILED), *line};
}

SshTestResult ssh_test()
{
    return probe_login(CurrentJob).result;
}

} // namespace bakjob
