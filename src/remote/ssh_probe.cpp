#include "remote/ssh_probe.h"

#include "common/address.h"
#include "common/debug_log.h"
#include "common/shell.h"
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
    std::optional<SshTestResult> result; // nothing: the host key has changed
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

std::optional<std::string> ssh_test_command(const RsyncJob &job, SshLogin login)
{
    return ssh_command(job, login, "ls / 2>&1");
}

SshTestResult ssh_test()
{
    if (CurrentJob.remote_ip[0] == '\0') return SSH_FAILED;
    const auto login = ssh_login_of(CurrentJob);
    const auto command = login ? ssh_test_command(CurrentJob, *login) : std::nullopt;
    DebugLog("ssh_test cmd[%s]\n", command ? command->c_str() : "");
    if (!command) return SSH_FAILED;

    auto reply = first_reply_line(*command);
    if (!reply) return SSH_FAILED;
    DebugLog("--->[%s]\n", reply->c_str());
    auto result = judge_ssh_reply(*reply);
    if (result) return *result;

    forget_host_key(CurrentJob.remote_ip);
    reply = first_reply_line(*command);
    result = reply ? judge_ssh_reply(*reply) : SSH_FAILED;
    return result.value_or(SSH_FAILED);
}

} // namespace bakjob
