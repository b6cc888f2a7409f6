#include "summary.h"

#include "cli/process_guard.h"
#include "common/address.h"
#include "fields.h"

#include <nlohmann/json.hpp>

namespace bakjob::ctl
{

namespace
{

// A state that claims a run is only believed when there is one.
void judge(Summary &summary, const RsyncJob &job)
{
    const StateWords state = words_of_state(job.state);
    summary.last = state.words;
    summary.outcome = state.outcome;
    if (summary.run == Run::GOING_ON) {
        summary.outcome = Outcome::RUNNING;
    } else if (summary.run == Run::LEFT_BEHIND) {
        summary.outcome = Outcome::FAILED;
        summary.last = "died in a run";
    } else if (state.outcome == Outcome::RUNNING) {
        summary.outcome = Outcome::FAILED;
        summary.last = "interrupted";
    }
    if (!summary.enabled && summary.outcome == Outcome::FAILED) summary.outcome = Outcome::FINE;
}

} // namespace

Run run_of(const std::string &name)
{
    const auto checked = JobName::checked(name);
    if (!checked || rsync_pid_file_absent(*checked)) return Run::NONE;
    return rsync_running_process(*checked) != 0 ? Run::GOING_ON : Run::LEFT_BEHIND;
}

std::string times_of(const ScheduleEntry &entry)
{
    return entry.minute + ' ' + entry.hour + ' ' + entry.day + ' ' + entry.month + ' ' + entry.weekday;
}

Summary summary_of(const StoredJob &job)
{
    const RsyncJob &record = job.record;
    const bool restored = record.rstate != JOB_IDLE && record.rstate != -1;
    Summary summary{.name = record.job_name,
                    .direction = word_of("backup_type", record.backup_type),
                    .remote = record.remote_ip,
                    .enabled = record.enable != 0,
                    .run = run_of(record.job_name),
                    .outcome = Outcome::FINE,
                    .last = {},
                    .time = record.last_do_job_time,
                    .restore = restored ? words_of_state(record.rstate).words : "",
                    .restore_time = restored ? record.rlast_do_job_time : "",
                    .schedule = job.schedule.empty() ? "" : times_of(job.schedule.front())};
    const bool brackets = ip_address_kind(record.remote_ip) != ADDRESS_IPV4;
    if (brackets) summary.remote = '[' + summary.remote + ']';
    summary.remote += record.rsync_mode == RSYNC_MODE_DAEMON ? "::" : ":";
    summary.remote += record.remote_path;
    judge(summary, record);
    return summary;
}

Json json_of(const Summary &summary)
{
    constexpr const char *OUTCOMES[] = {"fine", "failed", "running"};
    return {{"name", summary.name},
            {"direction", summary.direction},
            {"remote", summary.remote},
            {"enabled", summary.enabled},
            {"running", summary.run == Run::GOING_ON},
            {"outcome", OUTCOMES[static_cast<int>(summary.outcome)]},
            {"last", summary.last},
            {"time", summary.time},
            {"restore", summary.restore},
            {"restore_time", summary.restore_time},
            {"schedule", summary.schedule}};
}

} // namespace bakjob::ctl
