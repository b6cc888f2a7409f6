#include "cli/job_state.h"

#include "cli/process_guard.h"
#include "common/job_files.h"
#include "common/run_options.h"
#include "common/text.h"
#include "config/config_lock.h"
#include "config/job_list.h"
#include "config/job_store.h"
#include "platform/device.h"

#include <ctime>

namespace bakjob
{

namespace
{

void save_and_commit()
{
    rsync_save_jobs();
    LIB_CP_Config_To_MTD(1);
}

bool reset_if_stale(std::int32_t &state, char (&time)[JOB_TIME_SIZE], const char *now)
{
    if (rsync_state_is_running(state) == 0) return false;
    state = JOB_INTERRUPTED;
    copy_text(time, now);
    return true;
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
    const UniqueFd lock = rsync_lock_config(CONFIG_LOCK_FILE);
    rsync_load_jobs();
    RsyncJob *const job = rsync_find_job(job_name);
    if (job == nullptr) {
        rsync_free_jobs();
        return;
    }
    if (run_options.restore_mode != 0) {
        job->rstate = state;
        rsync_job_time(job->rlast_do_job_time);
    } else {
        job->state = state;
        rsync_job_time(job->last_do_job_time);
    }
    save_and_commit();
}

void rsync_reset_stale_states()
{
    const UniqueFd lock = rsync_lock_config(CONFIG_LOCK_FILE);
    rsync_load_jobs();
    char now[JOB_TIME_SIZE] = "";
    rsync_job_time(now);
    bool changed = false;
    for (RsyncJob *job = job_list->head; job != nullptr; job = job->next) {
        // A name that no run can have has no pid file either.
        const auto name = JobName::checked(job->job_name);
        if (name && !rsync_pid_file_absent(*name)) continue;
        changed |= reset_if_stale(job->state, job->last_do_job_time, now);
        changed |= reset_if_stale(job->rstate, job->rlast_do_job_time, now);
    }
    if (changed) {
        save_and_commit();
    } else {
        rsync_free_jobs();
    }
}

} // namespace bakjob
