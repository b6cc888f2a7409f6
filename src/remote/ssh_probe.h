#pragma once

// Proves that the remote host accepts an ssh login without asking, by running the harmless "ls /" there.

#include "config/job.h"
#include "remote/ssh_login.h"

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace bakjob
{

enum SshTestResult : std::int32_t {
    SSH_OK = 1,
    SSH_FAILED = 2, // no host, a refused value, an empty reply, or a host key that stays changed
    SSH_NO_ROUTE = 3,
    SSH_REFUSED = 4,
    SSH_DENIED = 5,
    SSH_TIMED_OUT = 7
};

struct LoginReply {
    SshTestResult result;
    std::string line; // that told it, or why there was none
};

// Tests the job's login. When the host's key has changed, the stored key is removed and the login is tried
// once more.
LoginReply probe_login(const RsyncJob &job);

// The login of CurrentJob, the result alone.
SshTestResult ssh_test();

// The command of the test.
Checked ssh_test_command(const RsyncJob &job, SshLogin login);

// What the first line of a login's reply means; nullopt: the host's key has changed.
std::optional<SshTestResult> judge_ssh_reply(std::string_view line);

} // namespace bakjob
