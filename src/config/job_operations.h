#pragma once

// Whole-job operations for the other parts of the appliance. Each is one complete cycle over the
// configuration store and leaves the job list empty. They answer 0 when the job was not found, the change was
// refused, or the jobs could not all be loaded; then the store is as it was. Else 1, also when the save
// failed, which only the trace says: who must know uses rsync_change_jobs. None copies the configuration to
// flash.

#include "config/job.h"

#include <string>

namespace bakjob
{

// Change one job. Hold the configuration lock from the load to the save; block while another holds it.
int rsync_enable_job(const std::string &job_name);
int rsync_disable_job(const std::string &job_name);

// Adds a job with the defaults of rsync_list_add_job. Refused when its name is taken.
int rsync_add_job(const RsyncJob &job);

// Puts `job` in the place of the job of that name, every field as given; a different `job_name` renames it.
// A stored job without a timetable (`schedule_mode` not 1) loses its scheduler entry first. Renamed onto
// another job's name, both are saved, and the next load keeps the first alone: look with rsync_job_exists. An
// unrecorded state (unrecorded_state.h) goes along.
int rsync_modify_job(const RsyncJob &job, const std::string &job_name);

// Deletes the job, the scheduler entries that name it and its unrecorded state.
int rsync_delete_job(const std::string &job_name);

// Read only; hold the lock while loading. rsync_get_job leaves `job` as it was when it answers 0.
int rsync_get_job(RsyncJob &job, const std::string &job_name);
int rsync_job_exists(const std::string &job_name);

} // namespace bakjob
