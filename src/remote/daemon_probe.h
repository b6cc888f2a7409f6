#pragma once

// Two probes of the remote rsync daemon, before a transfer: does it answer, and would the transfer be let in?
// Both read CurrentJob and return what its first line of output classifies as; a value that may not stand in
// a command gives REPLY_ERROR and nothing is run.

#include "config/job.h"
#include "remote/reply.h"

#include <optional>
#include <string>

namespace bakjob
{

// Asks the daemon for its modules.
RemoteReplyCode rsync_daemon_test();

// Tries the transfer as a dry run: in the job's own direction (`direction` 0) or towards the remote side (1).
RemoteReplyCode rsync_write_test(int direction);

// The command that lists the daemon's modules; nothing when the host is empty or refused.
std::optional<std::string> module_list_command(const RsyncJob &job);

// The command of the write test; nothing when a value is refused.
std::optional<std::string> write_test_command(const RsyncJob &job, int direction);

} // namespace bakjob
