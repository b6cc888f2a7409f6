#pragma once

// The job of the folder being transferred, with its defaults filled in: what the remote probes read.

#include "config/job.h"

namespace bakjob
{

extern RsyncJob CurrentJob;

// Fills CurrentJob from the caller's job. Of the defaults, only that of `rsync_pwd_file` is written back into
// the caller's job; a job without a proper name has none.
void rsync_prepare_current_job(RsyncJob &job);

} // namespace bakjob
