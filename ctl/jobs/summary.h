#pragma once

// Where a job stands, in short: what list, show, status and watch print.

#include "config/unrecorded_state.h"
#include "jobs/jobs.h"
#include "output/output.h"
#include "output/words.h"

#include <cstdint>
#include <string>

namespace bakjob::ctl
{

enum class Run {
    NONE,
    GOING_ON,
    LEFT_BEHIND // a pid file whose process is gone: runs are refused until bakjob -k
};

Run run_of(const std::string &name);

// The state of a job's backup or restore: as recorded in the configuration, or as the module has kept it when
// that could not be written.
struct Standing {
    std::int32_t state;
    std::string time;
    bool recorded;
};

Standing standing_of(const RsyncJob &job, StateKind kind);

struct Summary {
    std::string name;
    std::string direction;
    std::string remote;
    bool enabled;
    Run run;
    Outcome outcome;     // of the backup; a job that is switched off or never ran is fine
    std::string last;    // in words
    std::string time;    // when that was recorded, empty for a job that never ran
    std::string restore; // how the last restore ended, empty when there was none; it is not judged
    std::string restore_time;
    Outcome restore_outcome;
    std::string schedule; // in cron's notation, empty for none
};

Summary summary_of(const StoredJob &job);

Json json_of(const Summary &summary);

std::string times_of(const ScheduleEntry &entry);

} // namespace bakjob::ctl
