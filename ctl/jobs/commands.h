#pragma once

// Commands that show and change jobs and their timetables.

#include "output/request.h"

namespace bakjob::ctl
{

int list_jobs(const Request &request);
int show_job(const Request &request);
int show_status(const Request &request);
int show_keys(const Request &request);

int add_job(const Request &request);
int set_job(const Request &request);
int delete_job(const Request &request);
int enable_job(const Request &request);
int disable_job(const Request &request);
int schedule_job(const Request &request);
int unschedule_job(const Request &request);

} // namespace bakjob::ctl
