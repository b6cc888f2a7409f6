#pragma once

// The end of a run that a signal, or a failure such as a lack of memory, breaks off.

#include "cli/process_guard.h"
#include "common/job_name.h"

namespace bakjob
{

// Ends the run's commands (SIGTERM, after 5 seconds SIGKILL), records JOB_INTERRUPTED, and removes the
// password, progress and pid files and the copy of the remote daemon's configuration. Takes 15 seconds at
// most, but for what the disk takes. Never throws; a step that fails keeps none of the others from being
// done.
void rsync_end_broken_run(const JobName &job, const PidFile &pid_file) noexcept;

} // namespace bakjob
