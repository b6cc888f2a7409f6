#pragma once

// Questions to the remote side of CurrentJob. They change nothing there.

#include "remote/reply.h"
#include "remote/ssh_login.h"
#include "remote/ssh_test.h"

#include <optional>
#include <string>

namespace bakjob::ctl
{

// A run goes on when it does not know a reply's first line, and then fails in its transfer. Here the
// command's exit status counts, too: what fails is never taken for OK.
template <class Result>
struct Reply {
    Result result;
    std::string line; // the first one
};

// Of an ssh login; no result: the host's key has changed, and is left as it is.
using LoginReply = Reply<std::optional<SshTestResult>>;
LoginReply try_login(SshLogin login);

using DaemonReply = Reply<RemoteReplyCode>;
DaemonReply ask_daemon();   // for its modules
DaemonReply try_transfer(); // of the whole remote_path, in the job's direction

} // namespace bakjob::ctl
