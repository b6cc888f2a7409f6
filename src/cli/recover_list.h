#pragma once

// The snapshots of an incremental job, as a recover run numbers them: from 1 in the order of their names.

#include "common/fixed_text.h"
#include "config/job.h"

#include <cstdint>
#include <string>

struct dirent;

namespace bakjob
{

struct RecoverEntry {
    std::int32_t seq;     // 1 to 10
    char time[128];       // the folder's modification time, "%Y-%m-%d %H:%M:%S" in local time
    char path[PATH_SIZE]; // empty when it does not fit
};

struct RecoverList {
    static constexpr int SIZE = 10;

    std::uint8_t count;
    char job_name[JOB_NAME_SIZE];
    char dir[PATH_SIZE]; // the folder scanned
    RecoverEntry entries[SIZE];
};

extern RecoverList recover_list;

// Fills recover_list and traces each snapshot. 0 when the job is unknown, disabled or not an incremental job
// that fetches, or when nothing in its local folder has a snapshot's name; else 1.
int rsync_list_snapshots(const std::string &job_name);

void rsync_clear_snapshot_list();

// For scandir: 1 when the entry has a snapshot's name. The name before the full stop is `snapshot_prefix`.
int rsync_snapshot_filter(const dirent *entry);

} // namespace bakjob
