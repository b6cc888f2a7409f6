#pragma once

// Where a job stands, recorded in the configuration store for the appliance's pages. Each change is one whole
// cycle under the configuration lock: load, change, save, commit to flash.

#include "config/job.h"

#include <cstddef>
#include <string>

namespace bakjob
{

enum JobState : std::int32_t {
    JOB_IDLE = 0,           // never ran
    JOB_DONE_SCHEDULED = 1, // every folder succeeded, `schedule_mode` 3
    JOB_DONE = 2,           // every folder succeeded
    JOB_RUNNING = 3,
    JOB_FAILED = 4,
    JOB_INTERRUPTED = 8, // ended by a signal, or recorded as running while no process runs it
    JOB_RECOVER_FAILED = 9,
    JOB_RECOVER_RUNNING = 10,
    JOB_KILLED = 11,
    JOB_STARTING = 12
};

inline constexpr std::size_t JOB_TIME_SIZE = 32;

// The present as local time in English, for example "Sun Nov 22 2026 10:15:00 PM".
void rsync_job_time(char (&text)[JOB_TIME_SIZE]);

// 1 for the states that claim a run is going on, else 0.
int rsync_state_is_running(std::int32_t state);

// Records the state and the time of a job: in `rstate` during a restore run, else in `state`. A job that is
// not in the store changes nothing.
void rsync_set_job_state(const std::string &job_name, JobState state);

// Records JOB_INTERRUPTED, for a run that is ending. It waits for the lock no longer than limit_waits
// (interrupt.h) allows. After that, or when the configuration may be half changed, the state is kept beside
// the configuration (unrecorded_state.h).
void rsync_record_interruption(const std::string &job_name);

// Turns the running states of every job without a pid file into JOB_INTERRUPTED, or into the final state that
// the run has kept beside the configuration.
void rsync_reset_stale_states();

} // namespace bakjob
