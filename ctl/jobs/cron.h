#pragma once

// When a command runs, in cron's notation.

#include <array>
#include <string>

namespace bakjob::ctl
{

using CronTimes = std::array<std::string, 5>; // minute, hour, day, month, weekday

// Failure names the field, what was given and what is allowed.
CronTimes parse_cron_times(const std::string &text);

} // namespace bakjob::ctl
