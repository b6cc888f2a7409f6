#include "config/job_operations.h"

#include "common/job_files.h"
#include "config/config_lock.h"
#include "config/job_list.h"
#include "config/job_store.h"
#include "config/schedule.h"

namespace bakjob
{

namespace
{

// A save that fails is not the operations' to tell.
int change_jobs(const std::function<bool()> &change)
{
    const JobChange made = rsync_change_jobs(change);
    return made == JobChange::SAVED || made == JobChange::NOT_SAVED ? 1 : 0;
}

int change_job(const std::string &job_name, const std::function<bool(RsyncJob &)> &change)
{
    return change_jobs([&] {
        RsyncJob *const job = rsync_find_job(job_name);
        return job != nullptr && change(*job);
    });
}

int set_enable(const std::string &job_name, int value)
{
    return change_job(job_name, [&](RsyncJob &job) {
        job.enable = value;
        return true;
    });
}

int read_job(const std::string &job_name, const std::function<void(const RsyncJob &)> &read)
{
    {
        const UniqueFd lock = rsync_lock_config(CONFIG_LOCK_FILE);
        rsync_load_jobs();
    }
    const RsyncJob *const job = rsync_find_job(job_name);
    const int found = job != nullptr ? 1 : 0;
    if (job != nullptr) read(*job);
    rsync_free_jobs();
    return found;
}

} // namespace

JobChange rsync_change_jobs(const std::function<bool()> &change, WithoutLock without_lock)
{
    const UniqueFd lock = rsync_lock_config(CONFIG_LOCK_FILE);
    if (!lock && without_lock == WithoutLock::REFUSE) return JobChange::NOT_LOCKED;
    if (!rsync_load_jobs()) {
        rsync_free_jobs();
        return JobChange::NOT_LOADED;
    }
    if (!change()) {
        rsync_free_jobs();
        return JobChange::NONE;
    }
    return rsync_save_jobs() ? JobChange::SAVED : JobChange::NOT_SAVED;
}

int rsync_enable_job(const std::string &job_name)
{
    return set_enable(job_name, 1);
}

int rsync_disable_job(const std::string &job_name)
{
    return set_enable(job_name, 0);
}

int rsync_add_job(const RsyncJob &job)
{
    return change_jobs([&] { return rsync_list_add_job(job) == 1; });
}

int rsync_modify_job(const RsyncJob &job, const std::string &job_name)
{
    return change_job(job_name, [&](RsyncJob &stored) {
        if (stored.schedule_mode != SCHEDULE_TIMETABLE) rsync_remove_job_schedule(stored.job_name);
        rsync_copy_job(stored, job);
        return true;
    });
}

int rsync_delete_job(const std::string &job_name)
{
    return change_job(job_name, [](RsyncJob &job) { return rsync_list_remove_job(&job) == 1; });
}

int rsync_get_job(RsyncJob &job, const std::string &job_name)
{
    return read_job(job_name, [&](const RsyncJob &stored) { rsync_copy_job(job, stored); });
}

int rsync_job_exists(const std::string &job_name)
{
    return read_job(job_name, [](const RsyncJob &) {});
}

} // namespace bakjob
