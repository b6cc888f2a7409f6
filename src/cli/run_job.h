#pragma once

// What -r and -k do: one whole run of a job, folder by folder, and its end on request.

#include "config/job.h"
#include "transfer/backup.h"

#include <string>
#include <vector>

namespace bakjob
{

enum AlertCode : int {
    ALERT_FOLDER_FAILED = 1400,
    ALERT_RESTORE_FAILED = 1401,
    ALERT_FOLDER_DONE = 2402,
    ALERT_RESTORE_DONE = 2403
};

struct RunReport {
    std::vector<FolderOutcome> folders; // in their order; one more for those that could not be looked at
    Reason reason{};                    // it was refused, and nothing was changed, or interrupted

    [[nodiscard]] bool all_done() const;
};

// Runs the job: blocks until its last folder. `force` runs a job again that runs only once; the job is
// recorded as done only with `all_done_before`. SIGHUP, SIGINT and SIGTERM, unless they are ignored, end the
// run in order (broken_run.h) and then act as they would have without it.
RunReport run_job(const std::string &job_name, bool force, bool all_done_before = true);

// The same. `outcome` is cleared when a folder fails, and never set. False when the run was refused or
// interrupted.
bool rsync_run_job(const std::string &job_name, bool force, bool &outcome);

// Kills the job's process, its transfers and all else that it has started, and records that it was killed.
void rsync_kill_job(const std::string &job_name);

// Builds `alert_text` for the job as it stands: name, name of the device, and the folder's place. A text that
// does not fit is cut.
void rsync_alert_text(const RsyncJob &job);

} // namespace bakjob
