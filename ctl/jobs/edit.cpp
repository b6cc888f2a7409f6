// add, set, delete, enable, disable, schedule, unschedule: the commands that change the configuration.

#include "common/job_files.h"
#include "common/shell_text.h"
#include "config/config_lock.h"
#include "config/schedule.h"
#include "jobs/commands.h"
#include "jobs/cron.h"
#include "jobs/fields.h"
#include "jobs/jobs.h"
#include "jobs/scheduler_file.h"
#include "jobs/summary.h"
#include "output/failure.h"
#include "output/secret.h"

#include <cstdio>
#include <unistd.h>

namespace bakjob::ctl
{

namespace
{

// Passwords are asked for before anything is locked.
std::vector<Setting> settings_of(const Request &request)
{
    return parse_settings(request.settings,
                          [&](const std::string &key) { return read_secret(request.name + ": " + key); });
}

void require(const RsyncJob &job)
{
    for (const JobField &field : job_fields()) {
        const std::string_view key = field.key;
        const bool required = key == "remote_ip" || key == "remote_path" || key == "local_path";
        if (required && *text_field(job, field) == '\0') {
            throw Failure(std::string(key) + " is missing: it has no default");
        }
    }
}

int set_enable(const Request &request, int enable)
{
    change_job(request.name, [&](RsyncJobList &, RsyncJob &job) { job.enable = enable; });
    return EXIT_FINE;
}

// Under the lock, or a process that has read before the others' saves may be the last to write.
bool hand_over()
{
    const UniqueFd lock = rsync_lock_config(CONFIG_LOCK_FILE);
    return lock && rsync_apply_schedule() == 1;
}

// Changes a job and its timetable, saves, and hands the timetable over to the scheduler. Whether that took
// it.
bool change_timetable(const std::string &name,
                      const std::function<void(RsyncJobList &jobs, RsyncJob &job)> &change)
{
    bool changed = false;
    try {
        change_job(name, [&](RsyncJobList &jobs, RsyncJob &job) {
            change(jobs, job);
            changed = true;
        });
    } catch (const Failure &failure) {
        // Saved or not: the scheduler goes by what the file says now.
        if (!changed || hand_over()) throw;
        throw Failure(std::string(failure.what()) +
                      "; and the scheduler did not take over the timetables that it has");
    }
    return hand_over();
}

// The files of its runs, some with passwords. Copies and snapshots stay: they belong to people.
void remove_files_of(const std::string &name)
{
    const auto job = JobName::checked(name);
    if (!job) return;                          // no run can have the name
    if (run_of(name) == Run::GOING_ON) return; // the job was added again meanwhile
    for (const std::string &path :
         {password_file(*job), progress_file(*job), transfer_file(*job), transfer_size_file(*job),
          remote_config_copy(*job), unrecorded_file(*job)}) {
        std::remove(path.c_str());
    }
}

// The scheduler finds a job's entries by the job's name in single quotes. A name that has such a quote itself
// is written for the shell first, and then in a comment as the scheduler looks for it.
std::string run_command(const std::string &name)
{
    const std::string quoted = in_single_quotes(name);
    const std::string as_ruled = '\'' + name + '\'';
    const std::string comment = quoted == as_ruled ? "" : " # " + as_ruled;
    return "/usr/sbin/bakjob -r " + quoted + comment;
}

} // namespace

int add_job(const Request &request)
{
    const auto name = JobName::checked(request.name);
    if (!name) {
        throw Failure("\"" + request.name + "\" is not allowed as a job's name; allowed: up to " +
                      std::to_string(JOB_NAME_SIZE - 1) +
                      " bytes without / \" \\ | < > * ? and "
                      "control characters");
    }
    RsyncJob job = job_with_defaults(request.name);
    apply_settings(job, settings_of(request));
    require(job);
    change_jobs([&](RsyncJobList &jobs) {
        if (rsync_find_job(jobs, request.name) != nullptr) {
            throw Failure("there is a job \"" + request.name + "\" already");
        }
        if (rsync_list_add_job(jobs, job) == 0) throw Failure("no memory");
    });
    // Of an earlier job of this name.
    unlink(unrecorded_file(*name).c_str());
    return EXIT_FINE;
}

int set_job(const Request &request)
{
    if (request.settings.empty()) throw Failure("nothing to set: give key=value");
    const auto settings = settings_of(request);
    change_job(request.name, [&](RsyncJobList &, RsyncJob &job) {
        apply_settings(job, settings);
        require(job);
    });
    return EXIT_FINE;
}

int delete_job(const Request &request)
{
    const bool taken_over = change_timetable(request.name, [&](RsyncJobList &jobs, RsyncJob &job) {
        if (run_of(request.name) == Run::GOING_ON) {
            throw Failure("a run of it is going on; bakjob -k " + name_for_shell(request.name) + " ends it");
        }
        rsync_unschedule_job(jobs, request.name);
        jobs.remove(&job);
    });
    remove_files_of(request.name);
    if (!taken_over) {
        throw Failure("the job is deleted, but the scheduler did not take that over and goes on starting "
                      "runs, which are refused; bakjobctl schedule of any other job ends that");
    }
    return EXIT_FINE;
}

int enable_job(const Request &request)
{
    return set_enable(request, 1);
}

int disable_job(const Request &request)
{
    return set_enable(request, 0);
}

int schedule_job(const Request &request)
{
    const auto times = parse_cron_times(request.times);
    const std::string run = run_command(request.name);
    if (run.size() > MAX_SCHEDULED_COMMAND) throw Failure("the job's name is too long for the scheduler");
    const ScheduleEntry entry{times[0], times[1], times[2], times[3], times[4], "root", run};
    const bool taken_over = change_timetable(request.name, [&](RsyncJobList &jobs, RsyncJob &job) {
        rsync_unschedule_job(jobs, request.name);
        if (!rsync_add_schedule(entry)) {
            throw Failure("the configuration cannot take the entry: there are too many, or more than their "
                          "count says; nothing is changed");
        }
        job.schedule_mode = SCHEDULE_TIMETABLE;
    });
    if (!taken_over) {
        throw Failure("the timetable is in the configuration, but the scheduler did not take it over, so "
                      "nothing runs by it yet; run the same command again");
    }
    return EXIT_FINE;
}

int unschedule_job(const Request &request)
{
    const auto difference = schedule_difference(request.name);
    const bool left_over = difference && !difference->left_over.empty();
    const bool taken_over = change_timetable(request.name, [&](RsyncJobList &jobs, RsyncJob &) {
        if (rsync_unschedule_job(jobs, request.name) == 0 && !left_over)
            throw Failure("the job has no timetable");
    });
    if (!taken_over) {
        throw Failure("the timetable is no longer in the configuration, but the scheduler did not take that "
                      "over and goes on starting runs by it; run the same command again");
    }
    return EXIT_FINE;
}

} // namespace bakjob::ctl
