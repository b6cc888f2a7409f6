#pragma once

// The scheduler's entries for backup jobs: the group "rsync" of the scheduler's part of the configuration
// store. An entry names its job in the command that it runs.

#include <string_view>

namespace bakjob
{

// Deletes the entries that name no job of the job list; the last one left takes the group with it. Does not
// write the configuration file: the save that it is part of does.
void rsync_prune_schedule();

// 1 when the command holds the name of a job of the list in single quotes, else 0.
int rsync_schedule_names_job(std::string_view command);

// Deletes the first entry whose command holds the name anywhere, and then writes the configuration file.
void rsync_remove_job_schedule(const char *job_name);

// Adds an entry in cron's notation and has the scheduler take it over.
void rsync_create_schedule(const char *minute, const char *hour, const char *day, const char *month,
                           const char *weekday, const char *user, const char *run);

// Deletes all entries for backup jobs.
void rsync_delete_schedule();

} // namespace bakjob
