#include "config/job_state.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/run_options.h"
#include "common/text.h"
#include "config/job_change.h"
#include "config/process_guard.h"
#include "config/unrecorded_state.h"

#include <cerrno>
#include <cstring>
#include <ctime>
#include <exception>
#include <utility>
#include <vector>

namespace bakjob
{

namespace
{

// A state has to be on record somewhere, so a failure on the way ends nothing.
constexpr ChangeRules STATE_CHANGE = {
    .needs_lock = false, .needs_all = false, .to_flash = ToFlash::WHEN_LOADED};

// A state that is lost would leave the one before it to be believed.
void keep_unrecorded(const std::string &job_name, StateKind kind, const UnrecordedState &state)
{
    DebugLog("ERROR: state %d of [%s] is not recorded: the configuration could not be written\n", state.state,
             job_name.c_str());
    const auto name = JobName::checked(job_name);
    if (!name || rsync_keep_unrecorded(*name, kind, state)) return;
    DebugLog("ERROR: [%s]: %s\n", unrecorded_file(*name).c_str(), std::strerror(errno));
}

void forget_unrecorded(const std::string &job_name, StateKind kind)
{
    if (const auto name = JobName::checked(job_name)) rsync_forget_unrecorded(*name, kind);
}

StateKind kind_of_run()
{
    return is_restore_run() ? StateKind::RESTORE : StateKind::BACKUP;
}

void set_state(RsyncJob &job, StateKind kind, std::int32_t state, const std::string &time)
{
    (kind == StateKind::RESTORE ? job.rstate : job.state) = state;
    copy_text(kind == StateKind::RESTORE ? job.rlast_do_job_time : job.last_do_job_time, time);
}

// How a run ended that is recorded as going on and is not: as it has kept that itself, being unable to record
// it, or else interrupted.
UnrecordedState end_of_stale_run(const RsyncJob &job, StateKind kind, const char *now)
{
    const auto name = JobName::checked(job.job_name);
    auto kept = name ? rsync_unrecorded_state(*name, kind) : std::nullopt;
    if (kept && rsync_state_is_running(kept->state) == 0) return *std::move(kept);
    return {JOB_INTERRUPTED, now};
}

bool reset_if_stale(RsyncJob &job, StateKind kind, const char *now)
{
    if (rsync_state_is_running(kind == StateKind::RESTORE ? job.rstate : job.state) == 0) return false;
    const UnrecordedState end = end_of_stale_run(job, kind, now);
    set_state(job, kind, end.state, end.time);
    return true;
}

void record_state(const std::string &job_name, StateKind kind, JobState state)
{
    UnrecordedState as_set{state, {}};
    const JobChange made = rsync_change_jobs(
        [&](RsyncJobList &jobs) {
            RsyncJob *const job = rsync_find_job(jobs, job_name);
            if (job == nullptr && jobs.load_failure == nullptr) return false;
            char now[JOB_TIME_SIZE] = "";
            rsync_job_time(now);
            as_set.time = now;
            if (job != nullptr) set_state(*job, kind, state, now);
            return true;
        },
        STATE_CHANGE);
    if (made.result == ChangeResult::UNCHANGED) return;
    if (made.saved()) {
        forget_unrecorded(job_name, kind);
    } else {
        keep_unrecorded(job_name, kind, as_set);
    }
}

} // namespace

void rsync_job_time(char (&text)[JOB_TIME_SIZE])
{
    const std::time_t now = std::time(nullptr);
    std::tm local{};
    localtime_r(&now, &local);
    std::strftime(text, sizeof text, "%a %b %d %Y %I:%M:%S %p", &local);
}

int rsync_state_is_running(std::int32_t state)
{
    return state == JOB_RUNNING || state == JOB_RECOVER_RUNNING || state == JOB_STARTING ? 1 : 0;
}

void rsync_set_job_state(const std::string &job_name, JobState state)
{
    record_state(job_name, kind_of_run(), state);
}

void rsync_record_interruption(const std::string &job_name)
{
    if (!rsync_save_broken_off()) {
        try {
            rsync_free_jobs();
            rsync_set_job_state(job_name, JOB_INTERRUPTED);
            return;
        } catch (const std::exception &) { // somebody holds the lock, or there is no memory
        }
    }
    char now[JOB_TIME_SIZE] = "";
    rsync_job_time(now);
    keep_unrecorded(job_name, kind_of_run(), {JOB_INTERRUPTED, now});
}

void rsync_reset_stale_states()
{
    std::vector<std::pair<std::string, StateKind>> changed;
    const JobChange made = rsync_change_jobs(
        [&](RsyncJobList &jobs) {
            char now[JOB_TIME_SIZE] = "";
            rsync_job_time(now);
            for (RsyncJob *job = jobs.head; job != nullptr; job = job->next) {
                // A name that no run can have has no pid file either.
                const auto name = JobName::checked(job->job_name);
                if (name && !rsync_pid_file_absent(*name)) continue;
                for (const StateKind kind : {StateKind::BACKUP, StateKind::RESTORE}) {
                    if (reset_if_stale(*job, kind, now)) changed.emplace_back(job->job_name, kind);
                }
            }
            return !changed.empty();
        },
        STATE_CHANGE);
    if (made.result == ChangeResult::UNCHANGED) return;
    if (!made.saved()) {
        DebugLog("ERROR: stale states are not reset: the configuration could not be written\n");
        return;
    }
    for (const auto &[job_name, kind] : changed) {
        forget_unrecorded(job_name, kind);
    }
}

} // namespace bakjob
