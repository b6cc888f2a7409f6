#pragma once

// Questions to the remote side of CurrentJob. They change nothing there.

#include "config/job.h"
#include "remote/reply.h"
#include "remote/ssh_login.h"
#include "remote/ssh_probe.h"

#include <optional>
#include <string>

namespace bakjob::ctl
{

// Of an ssh login, by its first line and the command's exit status. No result: the host's key has changed,
// and is left as it is.
struct LoginReply {
    std::optional<SshTestResult> result;
    std::string line;
};
LoginReply try_login(SshLogin login);

// A run judges a reply of rsync by its first line alone, which is the daemon's greeting where it has one, and
// goes on when it does not know it. What is true takes the whole reply and the command's exit status: what
// fails is never taken for OK.
struct DaemonReply {
    RemoteReplyCode result;   // what is true
    std::string line;         // by which line of the reply
    RemoteReplyCode run_sees; // what a run takes it for
    std::string first;        // by this line
};
DaemonReply ask_daemon(); // for its modules
DaemonReply ask_port();   // the same, at the job's own port

// What a run looks by whether `remote_path` is there.
DaemonReply look_for_target();

// The transfer of a job with one folder and its two ends, as a dry run that does not go into folders.
DaemonReply try_transfer(const RsyncJob &job);

} // namespace bakjob::ctl
