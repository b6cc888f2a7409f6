// check: what can be seen on this device.

#include "check/findings.h"
#include "cli/source_folders.h"
#include "common/job_files.h"
#include "common/password.h"
#include "common/private_file.h"
#include "common/shell_text.h"
#include "config/current_job.h"
#include "config/job_state.h"
#include "jobs/config_file.h"
#include "jobs/cron.h"
#include "jobs/fields.h"
#include "jobs/scheduler_file.h"
#include "jobs/summary.h"
#include "output/failure.h"
#include "transfer/plan.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <optional>
#include <system_error>
#include <unistd.h>

namespace bakjob::ctl
{

namespace
{

class Check
{
public:
    Check(const RsyncJob &job, Findings &findings) : job_(job), findings_(findings) {}

    void problem(const std::string &about, const std::string &what, const std::string &todo)
    {
        findings_.push_back({Verdict::PROBLEM, about, what, todo});
    }
    void note(const std::string &about, const std::string &what, const std::string &todo)
    {
        findings_.push_back({Verdict::NOTE, about, what, todo});
    }

    void values();
    void passwords();
    void schedule(const std::vector<ScheduleEntry> &entries);
    void taken_over(const std::vector<ScheduleEntry> &entries);
    void configuration();
    void runs();
    void own_files();
    void snapshots();
    void programs();
    void serial();
    void folders();

private:
    void folder(const std::string &root, const std::string &folder);
    void missing_folder(const std::string &folder);
    void share_of(const std::string &root, const std::string &folder);

    const RsyncJob &job_;
    const std::optional<JobName> name_ = JobName::checked(job_.job_name);
    Findings &findings_;
};

bool pushes_to_module(const RsyncJob &job)
{
    return job.backup_type == BACKUP_PUSH && job.rsync_mode == RSYNC_MODE_DAEMON;
}

// How a run takes a value that could not be set so. An appliance of the same kind has logins of its own; each
// folder of `local_path` is looked at by itself.
Verdict verdict_on(const RsyncJob &job, const JobField &field)
{
    const std::string_view key = field.key;
    const bool named = job.server_type != SERVER_SAME_KIND;
    if (key == "local_path" && !was_cut(job, key)) return Verdict::FINE;
    if (key == "inc_number" && job.inc_enable != 1) return Verdict::FINE;
    if (key == "rsync_user" && (!named || job.rsync_mode != RSYNC_MODE_DAEMON)) return Verdict::FINE;
    if (key == "ssh_user" && (!named || job.use_ssh != 1)) return Verdict::FINE;
    if (key == "rsync_user" && *job.rsync_user == '\0') return Verdict::NOTE;
    return field.in_commands || key == "local_path" || key == "server_type" ? Verdict::PROBLEM
                                                                            : Verdict::NOTE;
}

void Check::values()
{
    if (!name_) {
        problem("job_name", "it is not allowed as a job's name", "Add the job anew under another name.");
    }
    for (const JobField &field : job_fields()) {
        const std::string why = refusal_of(job_, field);
        const Verdict verdict = why.empty() ? Verdict::FINE : verdict_on(job_, field);
        if (verdict == Verdict::FINE) continue;
        findings_.push_back(
            {verdict, field.key, why, "bakjobctl set NAME " + std::string(field.key) + "=VALUE"});
    }
    if (job_.rsync_mode == RSYNC_MODE_DAEMON && *job_.remote_path == '/') {
        problem("remote_path", "it begins with a slash instead of the daemon's module",
                "bakjobctl set NAME remote_path=MODULE/FOLDER, or rsync_mode=path");
    }
    if (*job_.rsync_pwd_file != '\0' && name_ && password_file(*name_) != job_.rsync_pwd_file) {
        problem("rsync_pwd_file", "the probes before a transfer read another one",
                "Delete the job and add it anew.");
    }
    if (job_.server_type == SERVER_SAME_KIND && *job_.rsync_user != '\0' &&
        std::string_view(job_.rsync_user) != DEFAULT_USER) {
        note("rsync_user", "a run looks by it for missing folders, but transfers as root",
             "bakjobctl set NAME rsync_user=root");
    }
    if (std::string_view(job_.port) != DEFAULT_PORT) {
        note("port", "only the transfer uses it: before it a run asks the daemon on port 873", "");
    }
    if (job_.enable == 0) problem("enable", "the job is switched off", "bakjobctl enable NAME");
}

void Check::passwords()
{
    char plain[PASSWORD_SIZE] = "";
    const bool encoded = job_.pwd_encoded != 0;
    const bool decodes = encoded && password_decode(plain, job_.rsync_pwd, sizeof plain) >= 0;
    if (job_.rsync_mode == RSYNC_MODE_DAEMON && !decodes) {
        problem("rsync_pwd", "it has no base64 form, so it is too long or damaged",
                "bakjobctl set NAME rsync_pwd=-");
    }
    char again[PASSWORD_SIZE] = "";
    if (*job_.ssh_pwd == '\0' || password_decode(again, job_.ssh_pwd, sizeof again) >= 0) return;
    const bool used = job_.use_ssh == 1 || pushes_to_module(job_);
    findings_.push_back({used ? Verdict::PROBLEM : Verdict::NOTE, "ssh_pwd", "it is not kept in base64",
                         "bakjobctl set NAME ssh_pwd=-"});
}

void Check::schedule(const std::vector<ScheduleEntry> &entries)
{
    if (entries.empty() && job_.schedule_mode == SCHEDULE_TIMETABLE) {
        note("timetable", "there is none: nothing starts the job by itself",
             "bakjobctl schedule NAME \"0 3 * * *\" runs it every day at three.");
    }
    if (entries.size() > 1) {
        note("timetable", "there are " + std::to_string(entries.size()) + " entries",
             "bakjobctl schedule NAME TIMES leaves one.");
    }
    for (const ScheduleEntry &entry : entries) {
        try {
            parse_cron_times(times_of(entry));
        } catch (const Failure &failure) {
            problem("timetable", failure.what(), "bakjobctl schedule NAME TIMES");
        }
    }
    taken_over(entries);
}

void Check::taken_over(const std::vector<ScheduleEntry> &entries)
{
    const auto difference = schedule_difference(job_.job_name);
    if (!difference) return;
    if (!difference->missing.empty()) {
        const std::string times = entries.empty() ? "TIMES" : '"' + times_of(entries.front()) + '"';
        problem("timetable", "the scheduler has not taken it over: " + difference->missing.front(),
                "bakjobctl schedule NAME " + times + " hands it over again.");
    }
    if (!difference->left_over.empty()) {
        problem("timetable",
                "the scheduler still has an entry that is not there any more: " +
                    difference->left_over.front(),
                entries.empty() ? "bakjobctl unschedule NAME takes it away."
                                : "bakjobctl schedule NAME TIMES leaves one.");
    }
}

void Check::configuration()
{
    const std::string why = why_not_writable();
    if (!why.empty()) {
        problem("configuration", "it cannot be written, so no run can record how it ended: " + why,
                "Make that folder writable, with room for the file twice.");
    }
    for (const StateKind kind : {StateKind::BACKUP, StateKind::RESTORE}) {
        const Standing standing = standing_of(job_, kind);
        if (standing.recorded) continue;
        problem("configuration",
                std::string("it could not be written in a ") +
                    (kind == StateKind::BACKUP ? "run" : "restore") +
                    ", and does not say: " + words_of_state(standing.state).words + ", " + standing.time,
                "The next run that can be recorded clears this.");
    }
}

void Check::runs()
{
    const Run run = run_of(job_.job_name);
    if (run == Run::GOING_ON) note("run", "one is going on now", "bakjobctl watch NAME follows it.");
    if (run == Run::LEFT_BEHIND) {
        problem("run", "one died and left " + pid_file(*name_) + ", so every other is refused",
                "rm PIDFILE && bakjob -k NAME ends what it has left, too.");
    }
    if (run == Run::NONE && rsync_state_is_running(job_.state) == 1) {
        note("state", "it says that a run is going on, but there is none", "bakjob -a clears that.");
    }
    if (job_.schedule_mode == SCHEDULE_ONCE && job_.state != JOB_IDLE) {
        problem(
            "schedule_mode", "the job runs once, and has run",
            "bakjob -b -r NAME runs it again; schedule_mode=timetable lets it run as often as it is told.");
    }
}

// A folder with something in it is not removed, and the file is not made.
void Check::own_files()
{
    if (!name_) return;
    for (const std::string &path : {password_file(*name_), remote_config_copy(*name_)}) {
        std::error_code ignored;
        if (!is_directory(path) || std::filesystem::is_empty(path, ignored)) continue;
        problem(path, "it is a folder, and a run has to make a file there",
                "Find out who made it, and take it away.");
    }
}

void Check::snapshots()
{
    if (job_.inc_enable != 1) return;
    if (job_.backup_type == BACKUP_PUSH) {
        note("inc_enable", "only a job that pulls keeps snapshots", "bakjobctl set NAME inc_enable=no");
    } else if (std::strchr(job_.local_path, ':') != nullptr) {
        note("local_path",
             "snapshots of a job with several folders are kept, but cannot be recovered by bakjob",
             "Make a job of each folder.");
    }
}

void Check::programs()
{
    struct Program {
        const char *path;
        bool needed;
    };
    const bool ssh = job_.use_ssh == 1 || job_.rsync_mode != RSYNC_MODE_DAEMON;
    const std::array programs = {Program{"/usr/sbin/bakjob", true}, Program{"/usr/sbin/rsync", true},
                                 Program{"/usr/sbin/ssh", ssh}, Program{"/usr/sbin/ssh-keygen", false},
                                 Program{"/bin/sh", true}};
    for (const Program &program : programs) {
        if (access(program.path, X_OK) == 0) continue;
        findings_.push_back({program.needed ? Verdict::PROBLEM : Verdict::NOTE, program.path,
                             std::strerror(errno), "Install it."});
    }
}

void Check::serial()
{
    char serial[SERIAL_SIZE] = "";
    const std::string refusal = rsync_serial_refusal();
    if (!refusal.empty()) {
        problem(SERIAL_FILE, refusal + ", so every folder fails",
                "Find out who wrote it, and let the appliance write it anew.");
    } else if (rsync_read_serial(serial) < 0 || *serial == '\0') {
        note(SERIAL_FILE, "it holds no serial text: the folder on the remote side has none in its name",
             "On the appliance it is written at its start.");
    } else if (std::strpbrk(serial, "\r\n") != nullptr) {
        problem(SERIAL_FILE, "its text has a line break: no remote folder can be named",
                "Write it without one.");
    }
}

void Check::folders()
{
    if (!name_) return;
    const std::string root = rsync_remote_root(*name_).value_or(""); // a refused one is a problem of its own
    const auto folders = folders_of(job_);
    if (folders.empty()) problem("local_path", "there is no folder", "bakjobctl set NAME local_path=FOLDER");
    for (const std::string &each : folders) {
        folder(root, each);
    }
}

void Check::share_of(const std::string &root, const std::string &folder)
{
    if (!enter_share(root, folder)) return;
    if (*share_path == '\0') {
        problem(folder, "no share holds it", "local_path names folders of the appliance's shares.");
    } else {
        problem(folder, std::string("its share's folder ") + share_path + " cannot be entered",
                "Is the volume there?");
    }
}

void Check::missing_folder(const std::string &folder)
{
    const bool pulls = job_.backup_type != BACKUP_PUSH;
    if (pulls && job_.inc_enable != 1) {
        note(folder, "it is not there: what a run fetches lands in a folder of that name inside of it",
             "Make it first.");
    } else {
        problem(folder, std::strerror(errno), "Make it, or name another.");
    }
}

void Check::folder(const std::string &root, const std::string &folder)
{
    const std::size_t before = findings_.size();
    share_of(root, folder);
    if (findings_.size() == before && access(folder.c_str(), F_OK) != 0) missing_folder(folder);
    if (findings_.size() != before) return;
    if (job_.backup_type != BACKUP_PUSH && access(folder.c_str(), W_OK) != 0) {
        problem(folder, std::string("nothing can be written there: ") + std::strerror(errno),
                "Make it writable.");
    }
    RsyncJob ended = job_;
    Refusal refusal = set_ends(ended, folder);
    if (!refusal) refusal = planned_command(ended, rsync_with_defaults(ended)).refusal();
    if (refusal) problem(folder, refusal.why, "A run cannot transfer it. Set what is refused anew.");
}

} // namespace

void check_here(const RsyncJob &job, const std::vector<ScheduleEntry> &schedule, Findings &findings)
{
    Check check(job, findings);
    check.values();
    check.passwords();
    check.schedule(schedule);
    check.configuration();
    check.runs();
    check.own_files();
    check.snapshots();
    check.programs();
    check.serial();
    check.folders();
}

} // namespace bakjob::ctl
