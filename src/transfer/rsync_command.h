#pragma once

// Turns one job, reduced to one folder, into the command line that copies its data. Runs nothing.

#include "common/refusal.h"
#include "config/job.h"

namespace bakjob
{

// The whole command, ending in a blank, for the job and the `recover_seq` of the process. `server_type` and
// whether there is an ssh password are read from `filled`, the job with its defaults. Refused when a value
// may not stand in a command or a piece does not fit its buffer.
Checked transfer_command(const RsyncJob &job, const RsyncJob &filled);

// The same with CurrentJob, which must be prepared.
Checked rsync_build_command(const RsyncJob &job);

} // namespace bakjob
