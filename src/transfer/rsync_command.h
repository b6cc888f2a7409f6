#pragma once

// Turns one job, reduced to one folder, into the command line that copies its data. Runs nothing.

#include "config/job.h"

#include <optional>
#include <string>

namespace bakjob
{

// The whole command, ending in a blank, for the job and the `recover_seq` of the process. `server_type` and
// whether there is an ssh password are read from CurrentJob, which must be prepared. Nothing when a value may
// not stand in a command or a piece does not fit its buffer.
std::optional<std::string> rsync_build_command(const RsyncJob &job);

} // namespace bakjob
