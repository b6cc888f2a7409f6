#pragma once

// Two probes of the remote rsync daemon, before a transfer: does it answer, and would the transfer be let in?
// The first line of a probe's output is classified (reply.h). A value that may not stand in a command gives
// REPLY_ERROR, and nothing is run.

#include "config/job.h"
#include "remote/reply.h"

namespace bakjob
{

// Asks the daemon for its modules.
ProbeReply probe_daemon(const RsyncJob &job);

// Tries the transfer as a dry run: in the job's own direction (`direction` 0) or towards the remote side (1).
ProbeReply probe_target(const RsyncJob &job, int direction);

// The same for CurrentJob, the code alone.
RemoteReplyCode rsync_daemon_test();
RemoteReplyCode rsync_write_test(int direction);

// The commands of the two.
Checked module_list_command(const RsyncJob &job);
Checked write_test_command(const RsyncJob &job, int direction);

} // namespace bakjob
