#pragma once

// Commands that look whether a job would run, and what the remote side has.

#include "output/request.h"

namespace bakjob::ctl
{

int check_job(const Request &request);
int show_remote(const Request &request);

} // namespace bakjob::ctl
