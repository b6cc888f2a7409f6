#pragma once

// The transfer of one source folder of one job: probes, preparation, snapshots, dry run, transfer, retries.

#include "common/job_name.h"
#include "common/reason.h"
#include "common/refusal.h"
#include "config/job.h"

namespace bakjob
{

enum BackupResult : int {
    BACKUP_DONE = 2,
    BACKUP_FAILED = 4,        // the transfer or its dry run failed, or a value was refused
    BACKUP_SSH_FAILED = 7,    // the ssh login failed
    BACKUP_REMOTE_FAILED = 8, // no daemon answers, or the remote path is missing
    BACKUP_RECOVER_FAILED = 9 // recover run: the remote side would not take the snapshot
};

struct FolderOutcome {
    BackupResult result;
    Reason reason{};  // none when it is done
    int attempts = 0; // dry runs
};

// Transfers the job's one folder. `job_name` is the name given on the command line; of the job only an empty
// `rsync_pwd_file` is changed. Blocks for as long as the probes, the transfers and the waits between them
// take.
FolderOutcome transfer_folder(const JobName &job_name, RsyncJob &job);

// The result alone.
BackupResult rsync_run_backup(const JobName &job_name, RsyncJob &job);

// Writes the job's password file: one line, readable by the owner alone. A refusal when the password has no
// such form or the file cannot be made.
Refusal write_password_file(const RsyncJob &job);

// That of CurrentJob; false when refused.
bool rsync_write_password_file();

// Waits; the result of the select call.
int select_sleep(int seconds, int milliseconds);

} // namespace bakjob
