#pragma once

// Where a job stands, in short: what list, show, status and watch tell.

#include "jobs.h"
#include "output.h"
#include "words.h"

#include <string>

namespace bakjob::ctl
{

enum class Run {
    NONE,
    GOING_ON,
    LEFT_BEHIND // a pid file whose process is gone: runs are refused until bakjob -k
};

Run run_of(const std::string &name);

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
    std::string schedule; // in cron's notation, empty for none
};

Summary summary_of(const StoredJob &job);

Json json_of(const Summary &summary);

std::string times_of(const ScheduleEntry &entry);

} // namespace bakjob::ctl
