#include "jobs/summary.h"

#include "common/address.h"
#include "config/process_guard.h"
#include "jobs/fields.h"

#include <nlohmann/json.hpp>

namespace bakjob::ctl
{

namespace
{

std::string note_on(const Standing &standing)
{
    return standing.recorded ? "" : ", not recorded: the configuration could not be written";
}

std::string words_of(const Standing &standing)
{
    return words_of_state(standing.state).words + note_on(standing);
}

// A running state counts only while a run is going on.
void judge(Summary &summary, const Standing &standing)
{
    summary.last = words_of(standing);
    summary.time = standing.time;
    summary.outcome = words_of_state(standing.state).outcome;
    const bool claims_run = summary.outcome == Outcome::RUNNING;
    if (summary.run == Run::GOING_ON) {
        summary.outcome = Outcome::RUNNING;
    } else if (summary.run == Run::LEFT_BEHIND) {
        summary.outcome = Outcome::FAILED;
        summary.last = "died in a run";
    } else if (claims_run) {
        summary.outcome = Outcome::FAILED;
        summary.last = "interrupted" + note_on(standing);
    }
    if (!summary.enabled && summary.outcome == Outcome::FAILED) summary.outcome = Outcome::FINE;
}

void judge_restore(Summary &summary, const Standing &standing)
{
    const bool restored = standing.state != JOB_IDLE && standing.state != -1;
    summary.restore_outcome = words_of_state(standing.state).outcome;
    if (!restored) return;
    summary.restore = words_of(standing);
    summary.restore_time = standing.time;
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

Standing standing_of(const RsyncJob &job, StateKind kind)
{
    const auto name = JobName::checked(job.job_name);
    const auto unrecorded = name ? rsync_unrecorded_state(*name, kind) : std::nullopt;
    if (unrecorded) return {unrecorded->state, unrecorded->time, false};
    if (kind == StateKind::RESTORE) return {job.rstate, job.rlast_do_job_time, true};
    return {job.state, job.last_do_job_time, true};
}

Summary summary_of(const StoredJob &job)
{
    const RsyncJob &record = job.record;
    Summary summary{.name = record.job_name,
                    .direction = word_of("backup_type", record.backup_type),
                    .remote = record.remote_ip,
                    .enabled = record.enable != 0,
                    .run = run_of(record.job_name),
                    .outcome = Outcome::FINE,
                    .last = {},
                    .time = {},
                    .restore = {},
                    .restore_time = {},
                    .restore_outcome = Outcome::FINE,
                    .schedule = job.schedule.empty() ? "" : times_of(job.schedule.front())};
    const bool brackets = ip_address_kind(record.remote_ip) != ADDRESS_IPV4;
    if (brackets) summary.remote = '[' + summary.remote + ']';
    summary.remote += record.rsync_mode == RSYNC_MODE_DAEMON ? "::" : ":";
    summary.remote += record.remote_path;
    judge(summary, standing_of(record, StateKind::BACKUP));
    judge_restore(summary, standing_of(record, StateKind::RESTORE));
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
