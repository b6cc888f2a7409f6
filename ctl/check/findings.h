#pragma once

// What a check of a job found.

#include "config/job.h"
#include "config/schedule.h"

#include <string>
#include <vector>

namespace bakjob::ctl
{

enum class Verdict {
    FINE,
    NOTE,   // a run would do, but perhaps not what is expected
    PROBLEM // a run would fail, or there will be none
};

struct Finding {
    Verdict verdict;
    std::string about; // a key, a folder, or a part of the remote side
    std::string what;
    std::string todo{}; // what to do about it
};

using Findings = std::vector<Finding>;

// Looks at the job and at this device; asks nobody.
void check_here(const RsyncJob &job, const std::vector<ScheduleEntry> &schedule, Findings &findings);

// Looks at what a job that fetches has and may bring into its folders: snapshots, links, setuid programs.
void check_local_copies(const RsyncJob &job, Findings &findings);

// Asks the remote side what a run would ask, folder by folder, and changes nothing there.
void check_remote_side(const RsyncJob &job, Findings &findings);

} // namespace bakjob::ctl
