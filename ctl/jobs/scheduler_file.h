#pragma once

// What the scheduler has taken over: the file that cron reads, against the timetables of the configuration.

#include <optional>
#include <string>
#include <vector>

namespace bakjob::ctl
{

// How the two differ about a job, in cron's lines.
struct ScheduleDifference {
    std::vector<std::string> missing;   // in the configuration alone: cron does not run them
    std::vector<std::string> left_over; // in cron's file alone
};

// Nullopt on a device without a folder for cron's files.
std::optional<ScheduleDifference> schedule_difference(const std::string &job_name);

} // namespace bakjob::ctl
