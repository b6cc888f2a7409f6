#pragma once

// Commands about what can be got back.

#include "output/request.h"

namespace bakjob::ctl
{

int show_snapshots(const Request &request);

} // namespace bakjob::ctl
