// add, set, delete, enable, disable, schedule, unschedule: whatever changes the configuration.

#include "commands.h"
#include "common/shell_text.h"
#include "config/job_list.h"
#include "config/schedule.h"
#include "cron.h"
#include "failure.h"
#include "fields.h"
#include "jobs.h"
#include "secret.h"
#include "summary.h"

namespace bakjob::ctl
{

namespace
{

constexpr std::size_t LONGEST_COMMAND = 255; // bytes of an entry's command that the module reads

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
    change_job(request.name, [&](RsyncJob &job) { job.enable = enable; });
    return EXIT_FINE;
}

void apply_schedule()
{
    if (rsync_apply_schedule() == 0) {
        throw Failure("the configuration is changed, but the scheduler did not take it over");
    }
}

// The scheduler's rule is that an entry holds the job's name in single quotes. A name that has one itself is
// written for the shell first, and then, behind what starts a comment, as the rule wants it.
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
    if (!is_job_name(request.name)) {
        throw Failure(
            "\"" + request.name +
            "\" is not allowed as a job's name; allowed: up to 127 bytes without / \" \\ | < > * ? and "
            "control characters");
    }
    RsyncJob job = job_with_defaults(request.name);
    apply_settings(job, settings_of(request));
    require(job);
    change_jobs([&] {
        if (rsync_find_job(request.name) != nullptr) {
            throw Failure("there is a job \"" + request.name + "\" already");
        }
        if (rsync_list_add_job(job) == 0) throw Failure("no memory");
    });
    return EXIT_FINE;
}

int set_job(const Request &request)
{
    if (request.settings.empty()) throw Failure("nothing to set: give key=value");
    const auto settings = settings_of(request);
    change_job(request.name, [&](RsyncJob &job) {
        apply_settings(job, settings);
        require(job);
    });
    return EXIT_FINE;
}

int delete_job(const Request &request)
{
    change_job(request.name, [&](RsyncJob &job) {
        if (run_of(request.name) == Run::GOING_ON) {
            throw Failure("a run of it is going on; bakjob -k " + name_for_shell(request.name) + " ends it");
        }
        rsync_unschedule_job(request.name);
        rsync_list_remove_job(&job);
    });
    apply_schedule();
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
    if (run.size() > LONGEST_COMMAND) throw Failure("the job's name is too long for the scheduler");
    change_job(request.name, [&](RsyncJob &job) {
        rsync_unschedule_job(request.name);
        const int created = rsync_create_schedule(times[0].c_str(), times[1].c_str(), times[2].c_str(),
                                                  times[3].c_str(), times[4].c_str(), "root", run.c_str());
        if (created == 0) {
            throw Failure("the scheduler did not take the entry over; bakjobctl show tells what it is to do");
        }
        job.schedule_mode = SCHEDULE_TIMETABLE;
    });
    return EXIT_FINE;
}

int unschedule_job(const Request &request)
{
    change_job(request.name, [&](RsyncJob &) {
        if (rsync_unschedule_job(request.name) == 0) throw Failure("the job has no timetable");
    });
    apply_schedule();
    return EXIT_FINE;
}

} // namespace bakjob::ctl
