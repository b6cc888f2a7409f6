#pragma once

// The end of a run that a signal, or a failure such as a lack of memory, breaks off.

#include "common/job_name.h"
#include "config/process_guard.h"

#include <string>
#include <vector>

namespace bakjob
{

// The files of a run that are not to stay: password, copy of the remote daemon's configuration, progress.
// Their names are made while there is memory.
std::vector<std::string> rsync_files_of_run(const JobName &job);

// Ends the run's commands (SIGTERM, after 5 seconds SIGKILL), records JOB_INTERRUPTED, and removes the run's
// files and its pid file, which stays when it cannot be told whether the commands have ended. Takes 15
// seconds at most, but for what the disk takes. A step that fails keeps none of the others from being done.
void rsync_end_broken_run(const JobName &job, const PidFile &pid_file,
                          const std::vector<std::string> &files) noexcept;

} // namespace bakjob
