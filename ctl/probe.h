#pragma once

// Questions to the remote side of CurrentJob. They change nothing there.

#include "config/job.h"
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
DaemonReply ask_daemon(); // for its modules
DaemonReply ask_port();   // the same, at the job's own port

// What a run looks by whether `remote_path` is there.
DaemonReply look_for_target();

// The transfer of a job with one folder and its two ends, as a dry run that does not go into folders.
DaemonReply try_transfer(const RsyncJob &job);

} // namespace bakjob::ctl
