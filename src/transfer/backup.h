#pragma once

// The transfer of one source folder of one job: probes, preparation, snapshots, dry run, transfer, retries.

#include "common/job_name.h"
#include "config/job.h"

#include <optional>
#include <string>

namespace bakjob
{

enum BackupResult : int {
    BACKUP_DONE = 2,
    BACKUP_FAILED = 4,        // the transfer or its dry run failed, or a value was refused
    BACKUP_SSH_FAILED = 7,    // the ssh login failed
    BACKUP_REMOTE_FAILED = 8, // no daemon answers, or the remote path is missing
    BACKUP_RECOVER_FAILED = 9 // recover run: the remote side would not take the snapshot
};

// Transfers the job's one folder. `job_name` is the name given on the command line; of the job only an empty
// `rsync_pwd_file` is changed. Blocks for as long as the probes, the transfers and the waits between them
// take.
BackupResult rsync_run_backup(const JobName &job_name, RsyncJob &job);

// The command of the transfer (rsync_command.h); also nothing when its dry run would not fit.
std::optional<std::string> rsync_transfer_command(const RsyncJob &job);

// Writes the password file of CurrentJob: one line, readable by the owner alone. False, with a trace, when
// the password has no such form or the file cannot be made.
bool rsync_write_password_file();

// Waits; the result of the select call.
int select_sleep(int seconds, int milliseconds);

} // namespace bakjob
