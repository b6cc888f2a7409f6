#include "transfer/backup.h"

#include "common/debug_log.h"
#include "common/interrupt.h"
#include "common/job_files.h"
#include "common/private_file.h"
#include "common/run_options.h"
#include "common/shell.h"
#include "common/text.h"
#include "config/current_job.h"
#include "config/job_state.h"
#include "remote/daemon_probe.h"
#include "remote/remote_dir.h"
#include "remote/ssh_probe.h"
#include "transfer/plan.h"
#include "transfer/row_guard.h"
#include "transfer/snapshot.h"
#include "transfer/snapshot_mark.h"

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <sys/select.h>
#include <sys/stat.h>

namespace bakjob
{

namespace
{

constexpr int RSYNC_PARTIAL = 23; // some files could not be transferred: trying again does not help

FolderOutcome failed(BackupResult result, const Reason &reason)
{
    return {result, reason};
}

// The outcome of a step that may have been refused.
FolderOutcome judged(RunStep step, const Refusal &refusal)
{
    if (!refusal) return {BACKUP_DONE};
    return failed(BACKUP_FAILED, {.step = step, .seen = refusal.why});
}

// Carries a plan out. A step's outcome is BACKUP_DONE when the next one may follow.
class FolderRun
{
public:
    FolderRun(const JobName &name, const RsyncJob &job) : name_(name), job_(job) {}

    FolderOutcome carry_out();

private:
    FolderOutcome log_in();
    FolderOutcome give_password();
    FolderOutcome ask_daemon();
    FolderOutcome reach_target();
    FolderOutcome make_target(const ProbeReply &missing);
    FolderOutcome write_command();
    FolderOutcome move_snapshots_up();
    FolderOutcome transfer();
    FolderOutcome transfer_with_retries();
    FolderOutcome transfer_once();

    const JobName &name_;
    const RsyncJob &job_;
    TransferPlan plan_ = plan_transfer(job_);
    std::string command_;
};

FolderOutcome FolderRun::carry_out()
{
    struct Act {
        RunStep step;
        FolderOutcome (FolderRun::*function)();
    };
    constexpr std::array ACTS = {
        Act{RunStep::LOGIN, &FolderRun::log_in},
        Act{RunStep::PASSWORD, &FolderRun::give_password},
        Act{RunStep::DAEMON, &FolderRun::ask_daemon},
        Act{RunStep::TARGET, &FolderRun::reach_target},
        Act{RunStep::COMMAND, &FolderRun::write_command},
        Act{RunStep::SNAPSHOTS, &FolderRun::move_snapshots_up},
        Act{RunStep::TRANSFER, &FolderRun::transfer},
    };
    FolderOutcome outcome = judged(RunStep::COMMAND, plan_.refusal);
    if (outcome.result == BACKUP_DONE) outcome = judged(RunStep::FOLDER, refusal_of_row(plan_.row));
    for (const RunStep step : plan_.steps) {
        for (const Act &act : ACTS) {
            if (act.step == step && outcome.result == BACKUP_DONE) outcome = (this->*act.function)();
        }
    }
    return outcome;
}

FolderOutcome FolderRun::log_in()
{
    const LoginReply reply = probe_login(CurrentJob);
    if (reply.result == SSH_OK) return {BACKUP_DONE};
    return failed(BACKUP_SSH_FAILED, {.step = RunStep::LOGIN, .seen = reply.line, .code = reply.result});
}

// Without its password file a daemon transfer could only fail, or worse, take somebody else's.
FolderOutcome FolderRun::give_password()
{
    const Refusal refusal = write_password_file(CurrentJob);
    return job_.rsync_mode == RSYNC_MODE_DAEMON ? judged(RunStep::PASSWORD, refusal)
                                                : FolderOutcome{BACKUP_DONE};
}

FolderOutcome FolderRun::ask_daemon()
{
    const ProbeReply reply = probe_daemon(CurrentJob);
    if (reply.code == REPLY_OK) return {BACKUP_DONE};
    return failed(BACKUP_REMOTE_FAILED, {.step = RunStep::DAEMON, .seen = reply.line, .code = reply.code});
}

FolderOutcome FolderRun::reach_target()
{
    const ProbeReply reply = probe_target(CurrentJob, is_recover_run() ? 1 : 0);
    const Reason reason{.step = RunStep::TARGET, .seen = reply.line, .code = reply.code};
    if (is_recover_run() && reply.code != REPLY_OK) return failed(BACKUP_RECOVER_FAILED, reason);
    if (is_recover_run() || reply.code != REPLY_NO_DIR) return {BACKUP_DONE};
    if (job_.backup_type != BACKUP_PUSH) return failed(BACKUP_REMOTE_FAILED, reason);
    return make_target(reply);
}

// Makes the folder that is missing, where that is possible.
FolderOutcome FolderRun::make_target(const ProbeReply &missing)
{
    const std::string_view remote_path = job_.remote_path;
    const std::size_t slash = remote_path.find('/');
    if (job_.rsync_mode != RSYNC_MODE_DAEMON || slash == std::string_view::npos) return {BACKUP_DONE};
    const auto without_slash = [](const char *text) { return *text == '\0' ? text : text + 1; };
    const MadeFolder made = make_remote_folder(CurrentJob, name_, std::string(remote_path.substr(0, slash)),
                                               without_slash(share_remote_dir), without_slash(share_subdir));
    const ProbeReply reply = probe_target(CurrentJob, 0);
    if (reply.code == REPLY_OK) return {BACKUP_DONE};
    Reason reason{.step = RunStep::TARGET, .seen = reply.line, .code = reply.code};
    if (made.why) reason.seen = missing.line + "; " + made.why.why;
    if (!made.why) reason.exit_code = exit_code(made.status);
    return failed(BACKUP_REMOTE_FAILED, reason);
}

FolderOutcome FolderRun::write_command()
{
    // The command ends in a slash for a folder, and would follow a link put in its place: guard that path,
    // too, from before the command is written.
    const Place place = look_at(job_.local_path);
    if (place.refusal) return judged(RunStep::FOLDER, place.refusal);
    if (place.is_folder) plan_.row.emplace_back(job_.local_path);
    const Checked command = planned_command(job_, CurrentJob);
    if (!command) return judged(RunStep::COMMAND, command.refusal());
    command_ = *command;
    std::remove(transfer_file(name_).c_str()); // figures of an earlier transfer
    return {BACKUP_DONE};
}

FolderOutcome FolderRun::move_snapshots_up()
{
    DebugLog("run rsync_snapshot_rotate() %s %d\n", job_.local_path, job_.inc_number);
    if (const Refusal refusal = refusal_of_row(plan_.row)) return judged(RunStep::FOLDER, refusal);
    copy_text(run_options.inc_root_path, plan_.newest);
    return judged(RunStep::SNAPSHOTS, rotate(plan_rotation(job_.local_path, job_.inc_number, job_.job_name)));
}

FolderOutcome FolderRun::transfer()
{
    DebugLog("rsync_cmd = [%s]\n", command_.c_str());
    rsync_set_job_state(name_.text(), is_recover_run() ? JOB_RECOVER_RUNNING : JOB_RUNNING);
    DebugLog("rsync_cmd = [%s]\n", dry_run_of(command_).c_str());
    FolderOutcome outcome = transfer_with_retries();
    if (plan_.newest.empty()) return outcome;
    DebugLog("inc_root_path = [%s]\n", plan_.newest.c_str());
    if (const Refusal refusal = refusal_of_row(plan_.row)) return judged(RunStep::FOLDER, refusal);
    utimensat(AT_FDCWD, plan_.newest.c_str(), nullptr, AT_SYMLINK_NOFOLLOW);
    if (outcome.result == BACKUP_DONE) write_out_and_mark_whole(plan_.newest);
    return outcome;
}

// Up to `retry` passes, at least one.
FolderOutcome FolderRun::transfer_with_retries()
{
    for (int attempt = 1;; ++attempt) {
        FolderOutcome outcome = transfer_once();
        const Reason &reason = outcome.reason;
        outcome.attempts = outcome.reason.attempt = attempt;
        const bool again = (reason.step == RunStep::DRY_RUN || reason.step == RunStep::TRANSFER) &&
                           reason.exit_code != RSYNC_PARTIAL && attempt < job_.retry;
        if (!again) return outcome;
        select_sleep(job_.retry_interval, 0);
    }
}

// A dry run and, if that went well, the transfer.
FolderOutcome FolderRun::transfer_once()
{
    if (const Refusal refusal = refusal_of_row(plan_.row)) return judged(RunStep::FOLDER, refusal);
    const auto ended = [](RunStep step, int code) {
        return failed(BACKUP_FAILED, {.step = step, .seen = code < 0 ? NOT_STARTED : "", .exit_code = code});
    };
    int code = exit_code(run_shell(dry_run_of(command_)));
    if (code != 0 && code != RSYNC_PARTIAL) {
        std::remove(transfer_size_file(name_).c_str());
        return ended(RunStep::DRY_RUN, code);
    }
    if (const Refusal refusal = refusal_of_row(plan_.row)) return judged(RunStep::FOLDER, refusal);
    if (!plan_.newest.empty()) {
        if (const Refusal refusal = take_mark_away(plan_.newest)) return judged(RunStep::SNAPSHOTS, refusal);
    }
    code = exit_code(run_shell(with_dump_size(command_)));
    return code == 0 ? FolderOutcome{BACKUP_DONE} : ended(RunStep::TRANSFER, code);
}

} // namespace

Refusal write_password_file(const RsyncJob &job)
{
    std::remove(job.rsync_pwd_file);
    char password[PASSWORD_SIZE] = "";
    const bool encoded = job.pwd_encoded != 0;
    const bool wants_plain = job.server_type == SERVER_ANY;
    int length = 0;
    if (encoded && wants_plain) {
        length = password_decode(password, job.rsync_pwd, sizeof password);
    } else if (!encoded && !wants_plain) {
        length = password_encode(password, job.rsync_pwd, sizeof password);
    } else {
        copy_text(password, job.rsync_pwd);
    }
    if (length < 0) {
        return refused("rsync_pwd", std::string("it has no ") + (wants_plain ? "plain" : "base64") + " form");
    }
    if (replace_file(job.rsync_pwd_file, 0600, std::string(password) + '\n')) return {};
    return trace_refusal(std::string("rsync_pwd_file [") + job.rsync_pwd_file + "]: " + std::strerror(errno));
}

bool rsync_write_password_file()
{
    return !write_password_file(CurrentJob);
}

int select_sleep(int seconds, int milliseconds)
{
    timeval time{.tv_sec = seconds, .tv_usec = suseconds_t{1000} * milliseconds};
    const int result = select(0, nullptr, nullptr, nullptr, &time);
    throw_if_interrupted();
    return result;
}

FolderOutcome transfer_folder(const JobName &job_name, RsyncJob &job)
{
    rsync_prepare_current_job(job);
    return FolderRun(job_name, job).carry_out();
}

BackupResult rsync_run_backup(const JobName &job_name, RsyncJob &job)
{
    return transfer_folder(job_name, job).result;
}

} // namespace bakjob
