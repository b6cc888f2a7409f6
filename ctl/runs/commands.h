#pragma once

// Commands about runs.

#include "output/request.h"

namespace bakjob::ctl
{

int watch_job(const Request &request);

} // namespace bakjob::ctl
