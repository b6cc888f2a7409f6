#pragma once

// The folder being transferred: its job, with its defaults filled in, and its place in a network share.

#include "common/fixed_text.h"
#include "config/job.h"

namespace bakjob
{

extern RsyncJob CurrentJob;

// The job with its defaults filled in. A job without a proper name has no password file.
RsyncJob rsync_with_defaults(const RsyncJob &job);

// Fills CurrentJob with the caller's job and its defaults, of which only `rsync_pwd_file` is written back
// into the caller's job.
void rsync_prepare_current_job(RsyncJob &job);

// Filled when the folder is resolved.
extern char share_remote_dir[PATH_SIZE]; // the backup root and the share's name
extern char share_path[PATH_SIZE];       // the share's folder on this device
extern char share_subdir[PATH_SIZE];     // the folder's place below the share: "/" for the share itself

} // namespace bakjob
