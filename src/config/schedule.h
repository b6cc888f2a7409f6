#pragma once

// The scheduler's entries for backup jobs: the group "rsync" of the scheduler's part of the configuration
// store. An entry names its job in the command that it runs.
//
// A function without a job list as its argument uses the process's one list.

#include "config/job_list.h"

#include <string>
#include <string_view>
#include <vector>

namespace bakjob
{

// Bytes of the longest command that an entry is made with.
inline constexpr std::size_t MAX_SCHEDULED_COMMAND = 255;

// When an entry runs, in cron's notation, and what.
struct ScheduleEntry {
    std::string minute, hour, day, month, weekday, user, run;
};

// The entries of a job: their command holds its name in single quotes, and that of no listed job with a
// longer name.
std::vector<ScheduleEntry> rsync_job_schedule(const RsyncJobList &jobs, std::string_view job_name);

// Deletes them; how many there were. The configuration file is the caller's to write, and then the
// scheduler's to take over by rsync_apply_schedule.
int rsync_unschedule_job(const RsyncJobList &jobs, std::string_view job_name);

// Whether an entry with this command is one of them.
bool rsync_schedules_job(const RsyncJobList &jobs, std::string_view command, std::string_view job_name);

// Every entry of the scheduler, those of other groups than the backup jobs' as well.
std::vector<ScheduleEntry> rsync_all_schedules();

// Adds an entry; saving and handing over are up to the caller, as above. False, with nothing added, when the
// store refuses it, or has more entries than their count says: it would replace one of them.
bool rsync_add_schedule(const ScheduleEntry &entry);

// Deletes the entries that name no listed job, and the group when none is left. Writes no configuration file:
// that is up to the save. True when something was deleted; then the scheduler has been told.
bool rsync_prune_schedule(const RsyncJobList &jobs);
bool rsync_prune_schedule();

// 1 when the command holds the name of a listed job in single quotes, else 0.
int rsync_schedule_names_job(std::string_view command);

// Deletes the first entry whose command holds the name anywhere, and then writes the configuration file.
void rsync_remove_job_schedule(const char *job_name);

// Adds an entry and has the scheduler take it over. 1 when both did so, else 0.
int rsync_create_schedule(const char *minute, const char *hour, const char *day, const char *month,
                          const char *weekday, const char *user, const char *run);

// Has the scheduler take over what the configuration says. 1 when it did, else 0.
int rsync_apply_schedule();

// Deletes all entries for backup jobs.
void rsync_delete_schedule();

} // namespace bakjob
