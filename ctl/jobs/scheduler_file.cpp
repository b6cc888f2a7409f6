#include "jobs/scheduler_file.h"

#include "common/job_files.h"
#include "common/private_file.h"
#include "config/config_lock.h"
#include "config/schedule.h"
#include "jobs/jobs.h"
#include "jobs/summary.h"

#include <algorithm>
#include <fstream>
#include <set>

namespace bakjob::ctl
{

namespace
{

constexpr const char *CRON_FOLDER = "/etc/cron.d";
constexpr const char *CRON_FILE = "/etc/cron.d/device_scheduler";

// cron takes a bare per cent sign in a command for a line break.
std::string cron_line(const ScheduleEntry &entry)
{
    std::string line = times_of(entry) + ' ' + entry.user + ' ';
    for (const char c : entry.run) {
        if (c == '%') line += '\\';
        line += c;
    }
    return line;
}

std::string command_in(const std::string &line)
{
    std::string command;
    for (std::size_t i = 0; i < line.size(); ++i) {
        if (line[i] == '\\' && i + 1 < line.size() && line[i + 1] == '%') continue;
        command += line[i];
    }
    return command;
}

std::set<std::string> cron_lines()
{
    std::set<std::string> lines;
    std::ifstream file(CRON_FILE);
    for (std::string line; std::getline(file, line);) {
        lines.insert(line);
    }
    return lines;
}

} // namespace

std::optional<ScheduleDifference> schedule_difference(const std::string &job_name)
{
    if (!is_directory(CRON_FOLDER)) return std::nullopt;
    const UniqueFd lock = rsync_lock_config(CONFIG_LOCK_FILE);
    const RsyncJobList &jobs = load_jobs();
    ScheduleDifference difference;
    std::set<std::string> taken_over = cron_lines();
    for (const ScheduleEntry &entry : rsync_job_schedule(jobs, job_name)) {
        const std::string line = cron_line(entry);
        if (!taken_over.contains(line)) difference.missing.push_back(line);
    }
    for (const ScheduleEntry &entry : rsync_all_schedules()) {
        taken_over.erase(cron_line(entry));
    }
    std::copy_if(
        taken_over.begin(), taken_over.end(), std::back_inserter(difference.left_over),
        [&](const std::string &line) { return rsync_schedules_job(jobs, command_in(line), job_name); });
    rsync_free_jobs();
    return difference;
}

} // namespace bakjob::ctl
