#pragma once

// Questions to a job's remote side, for a job with its defaults filled in. They change nothing there.

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
struct LoginAnswer {
    std::optional<SshTestResult> result;
    std::string line;
};
LoginAnswer try_login(const RsyncJob &job, SshLogin login);

// A run judges a reply of rsync by its first line alone, which is the daemon's greeting where it has one, and
// goes on when it does not know it. What is true takes the whole reply and the command's exit status: what
// fails is never taken for OK.
struct DaemonAnswer {
    RemoteReplyCode result;   // what is true
    std::string line;         // by which line of the reply
    RemoteReplyCode run_sees; // what a run takes it for
    std::string first;        // by this line
};
DaemonAnswer ask_daemon(const RsyncJob &job); // for its modules
DaemonAnswer ask_port(const RsyncJob &job);   // the same, at the job's own port

// What a run looks by whether `remote_path` is there.
DaemonAnswer look_for_target(const RsyncJob &job);

// The command of a transfer, as a dry run that does not go into folders.
DaemonAnswer try_transfer(const Checked &command);

} // namespace bakjob::ctl
