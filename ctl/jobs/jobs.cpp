#include "jobs/jobs.h"

#include "cli/source_folders.h"
#include "common/folder_table.h"
#include "common/job_files.h"
#include "common/shell_text.h"
#include "config/config_lock.h"
#include "config/job_change.h"
#include "config/job_store.h"
#include "output/failure.h"

#include <cerrno>
#include <cstring>

namespace bakjob::ctl
{

namespace
{

[[noreturn]] void no_such_job(const std::string &name)
{
    throw Failure("there is no job \"" + name + "\"; bakjobctl list shows the jobs");
}

} // namespace

const RsyncJobList &load_jobs()
{
    if (rsync_load_jobs()) return *job_list;
    throw Failure(std::string("not all jobs can be read: ") + job_list->load_failure);
}

std::vector<StoredJob> read_jobs()
{
    const UniqueFd lock = rsync_lock_config(CONFIG_LOCK_FILE);
    const RsyncJobList &list = load_jobs();
    std::vector<StoredJob> jobs;
    for (const RsyncJob *job = list.head; job != nullptr; job = job->next) {
        rsync_copy_job(jobs.emplace_back().record, *job);
        jobs.back().schedule = rsync_job_schedule(list, job->job_name);
    }
    rsync_free_jobs();
    return jobs;
}

StoredJob read_job(const std::string &name)
{
    for (StoredJob &job : read_jobs()) {
        if (name == job.record.job_name) return std::move(job);
    }
    no_such_job(name);
}

void change_jobs(const std::function<void(RsyncJobList &jobs)> &change)
{
    const auto changing = [&](RsyncJobList &jobs) {
        change(jobs);
        return true;
    };
    const JobChange made = rsync_change_jobs(changing, {.needs_lock = true, .to_flash = ToFlash::WHEN_SAVED});
    switch (made.result) {
    case ChangeResult::NOT_LOCKED:
        throw Failure(std::string(CONFIG_LOCK_FILE) + " cannot be locked: " + std::strerror(errno) +
                      "; nothing is changed");
    case ChangeResult::NOT_LOADED:
        throw Failure(std::string("nothing is changed, as not all jobs can be read: ") +
                      job_list->load_failure);
    case ChangeResult::NOT_SAVED:
        throw Failure("the configuration could not be written");
    case ChangeResult::NOT_IN_FLASH:
        throw Failure("the configuration is changed, but could not be copied to flash");
    case ChangeResult::UNCHANGED:
    case ChangeResult::SAVED:
        return;
    }
}

void change_job(const std::string &name, const std::function<void(RsyncJobList &jobs, RsyncJob &job)> &change)
{
    change_jobs([&](RsyncJobList &jobs) {
        RsyncJob *const job = rsync_find_job(jobs, name);
        if (job == nullptr) no_such_job(name);
        change(jobs, *job);
    });
}

std::vector<std::string> folders_of(const RsyncJob &job)
{
    RsyncJob to_split = job;
    FolderTable folders{};
    rsync_split_folders(to_split, folders);
    return {folders.entries, folders.entries + folders.count};
}

std::string name_for_shell(const std::string &name)
{
    const bool plain =
        !name.empty() && shell_word(name) == name && name.find_first_of("!~") == std::string::npos;
    return plain ? name : in_single_quotes(name);
}

} // namespace bakjob::ctl
