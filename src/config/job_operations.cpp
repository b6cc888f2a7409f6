#include "config/job_operations.h"

#include "common/job_files.h"
#include "config/config_lock.h"
#include "config/job_change.h"
#include "config/job_list.h"
#include "config/job_store.h"
#include "config/schedule.h"
#include "config/unrecorded_state.h"

#include <functional>
#include <string_view>

namespace bakjob
{

namespace
{

// A save that fails is not the operations' to tell.
int answer_of(const JobChange &made)
{
    return made.result == ChangeResult::SAVED || made.result == ChangeResult::NOT_SAVED ? 1 : 0;
}

JobChange change_job(const std::string &job_name,
                     const std::function<bool(RsyncJobList &jobs, RsyncJob &job)> &change)
{
    return rsync_change_jobs([&](RsyncJobList &jobs) {
        RsyncJob *const job = rsync_find_job(jobs, job_name);
        return job != nullptr && change(jobs, *job);
    });
}

// Without a new name, or with one that no run can have, the state is removed.
void move_unrecorded(const std::string &job_name, std::string_view new_name)
{
    const auto from = JobName::checked(job_name);
    const auto to = JobName::checked(new_name);
    if (from && to) rsync_rename_unrecorded(*from, *to);
    if (from && !to) rsync_forget_unrecorded(*from);
}

int set_enable(const std::string &job_name, int value)
{
    return answer_of(change_job(job_name, [&](RsyncJobList &, RsyncJob &job) {
        job.enable = value;
        return true;
    }));
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
    return answer_of(
        rsync_change_jobs([&](RsyncJobList &jobs) { return rsync_list_add_job(jobs, job) == 1; }));
}

int rsync_modify_job(const RsyncJob &job, const std::string &job_name)
{
    bool first_of_its_name = false;
    const JobChange made = change_job(job_name, [&](RsyncJobList &jobs, RsyncJob &stored) {
        if (stored.schedule_mode != SCHEDULE_TIMETABLE) rsync_remove_job_schedule(stored.job_name);
        rsync_copy_job(stored, job);
        first_of_its_name = rsync_find_job(jobs, job.job_name) == &stored;
        return true;
    });
    if (made.saved() && job_name != job.job_name) {
        move_unrecorded(job_name, first_of_its_name ? job.job_name : "");
    }
    return answer_of(made);
}

int rsync_delete_job(const std::string &job_name)
{
    const JobChange made =
        change_job(job_name, [](RsyncJobList &jobs, RsyncJob &job) { return jobs.remove(&job); });
    if (made.saved()) move_unrecorded(job_name, "");
    return answer_of(made);
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
