#pragma once

// Jobs as the commands need them: read whole, or changed, saved and copied to flash.

#include "config/job_list.h"
#include "config/schedule.h"

#include <functional>
#include <string>
#include <vector>

namespace bakjob::ctl
{

struct StoredJob {
    RsyncJob record;
    std::vector<ScheduleEntry> schedule;
};

// Loads the process's list; Failure when a job may be left out.
const RsyncJobList &load_jobs();

std::vector<StoredJob> read_jobs();

// Failure when there is no job of that name.
StoredJob read_job(const std::string &name);

// Runs `change` on the loaded job list under the configuration lock, saves, and copies the configuration to
// flash. Nothing is saved when `change` throws. Failure without the lock, when a job may be missing from the
// list, and when the save or the copy fails.
void change_jobs(const std::function<void(RsyncJobList &jobs)> &change);

// The same for one job.
void change_job(const std::string &name,
                const std::function<void(RsyncJobList &jobs, RsyncJob &job)> &change);

// The folders of a job that a run would transfer.
std::vector<std::string> folders_of(const RsyncJob &job);

// A job's name as a word of a shell's command line.
std::string name_for_shell(const std::string &name);

} // namespace bakjob::ctl
