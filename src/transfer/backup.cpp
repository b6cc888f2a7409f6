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
#include "transfer/row_guard.h"
#include "transfer/rsync_command.h"
#include "transfer/snapshot.h"
#include "transfer/snapshot_mark.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <optional>
#include <sys/select.h>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace bakjob
{

namespace
{

constexpr int LOCAL_SIDE_REFUSED = -2; // no command ends so
constexpr int RSYNC_PARTIAL = 23;      // some files could not be transferred: trying again does not help

bool is_recover_run()
{
    return run_options.recover_seq != 0;
}

// Makes the folder that the write test missed, where that is possible. Whether the run may go on.
bool prepare_missing_target(const JobName &job_name, const RsyncJob &job)
{
    if (job.backup_type != BACKUP_PUSH) return false;
    const std::string_view remote_path = job.remote_path;
    const std::size_t slash = remote_path.find('/');
    if (job.rsync_mode != RSYNC_MODE_DAEMON || slash == std::string_view::npos) return true;
    const auto without_slash = [](const char *text) { return *text == '\0' ? text : text + 1; };
    rsync_prepare_remote_dir(job_name, std::string(remote_path.substr(0, slash)),
                             without_slash(share_remote_dir), without_slash(share_subdir));
    return rsync_write_test(0) == REPLY_OK;
}

// Nothing when the remote side is ready for the transfer.
std::optional<BackupResult> check_remote_side(const JobName &job_name, const RsyncJob &job)
{
    if (is_recover_run()) {
        if (rsync_write_test(1) != REPLY_OK) return BACKUP_RECOVER_FAILED;
        return std::nullopt;
    }
    if (rsync_daemon_test() != REPLY_OK) return BACKUP_REMOTE_FAILED;
    if (rsync_write_test(0) == REPLY_NO_DIR && !prepare_missing_target(job_name, job)) {
        return BACKUP_REMOTE_FAILED;
    }
    return std::nullopt;
}

std::string with_dump_size(const std::string &command)
{
    return command + " --dump-size ";
}

std::string dry_run_of(const std::string &command)
{
    return with_dump_size(command) + " --dry-run >/dev/null 2>&1";
}

// Where a run works on this device.
struct LocalSide {
    std::vector<std::string> folders; // whatever stands at their paths must be folders
    std::string newest;               // snapshot that the transfer writes into; empty when it makes none
};

// Up to `retry` passes, at least one, each a dry run and, if that went well, the transfer. The exit code of
// the last command, or LOCAL_SIDE_REFUSED.
int transfer_with_retries(const JobName &job_name, const RsyncJob &job, const std::string &command,
                          const LocalSide &local)
{
    const std::string dry_run = dry_run_of(command);
    DebugLog("rsync_cmd = [%s]\n", dry_run.c_str());
    int attempts_left = job.retry;
    for (;;) {
        if (!are_folders(local.folders)) return LOCAL_SIDE_REFUSED;
        int code = exit_code(run_shell(dry_run));
        if (code == 0 || code == RSYNC_PARTIAL) {
            if (!are_folders(local.folders)) return LOCAL_SIDE_REFUSED;
            if (!local.newest.empty() && !take_mark_away(local.newest)) return LOCAL_SIDE_REFUSED;
            code = exit_code(run_shell(with_dump_size(command)));
        } else {
            std::remove(transfer_size_file(job_name).c_str());
        }
        --attempts_left;
        if (code == 0 || code == RSYNC_PARTIAL || attempts_left <= 0) return code;
        select_sleep(job.retry_interval, 0);
    }
}

} // namespace

std::optional<std::string> rsync_transfer_command(const RsyncJob &job)
{
    auto command = rsync_build_command(job);
    if (command && !fits_command(dry_run_of(*command))) {
        DebugLog("ERROR: transfer command refused: too long\n");
        command.reset();
    }
    return command;
}

bool rsync_write_password_file()
{
    std::remove(CurrentJob.rsync_pwd_file);
    char password[PASSWORD_SIZE] = "";
    const bool encoded = CurrentJob.pwd_encoded != 0;
    const bool wants_plain = CurrentJob.server_type == SERVER_ANY;
    int length = 0;
    if (encoded && wants_plain) {
        length = password_decode(password, CurrentJob.rsync_pwd, sizeof password);
    } else if (!encoded && !wants_plain) {
        length = password_encode(password, CurrentJob.rsync_pwd, sizeof password);
    } else {
        copy_text(password, CurrentJob.rsync_pwd);
    }
    if (length < 0) {
        DebugLog("ERROR: rsync_pwd refused: it has no %s form\n", wants_plain ? "plain" : "base64");
        return false;
    }
    if (replace_file(CurrentJob.rsync_pwd_file, 0600, std::string(password) + '\n')) return true;
    DebugLog("ERROR: rsync_pwd_file [%s]: %s\n", CurrentJob.rsync_pwd_file, std::strerror(errno));
    return false;
}

int select_sleep(int seconds, int milliseconds)
{
    timeval time{.tv_sec = seconds, .tv_usec = suseconds_t{1000} * milliseconds};
    const int result = select(0, nullptr, nullptr, nullptr, &time);
    throw_if_interrupted();
    return result;
}

BackupResult rsync_run_backup(const JobName &job_name, RsyncJob &job)
{
    rsync_prepare_current_job(job);
    if (job.server_type != SERVER_SAME_KIND && job.server_type != SERVER_ANY) {
        DebugLog("ERROR: server_type refused: %d\n", job.server_type);
        return BACKUP_FAILED;
    }
    if (!has_whole_texts(job)) return BACKUP_FAILED;
    LocalSide local{snapshots_in_use(job), ""};
    if (!are_folders(local.folders)) return BACKUP_FAILED;
    if (job.use_ssh == 1 && ssh_test() != SSH_OK) return BACKUP_SSH_FAILED;
    // Without its password file a daemon transfer could only fail, or worse, take somebody else's.
    if (!rsync_write_password_file() && job.rsync_mode == RSYNC_MODE_DAEMON) return BACKUP_FAILED;
    if (const auto failure = check_remote_side(job_name, job)) return *failure;

    // The command names the contents of a folder, and those of one behind a link just as well.
    const auto names_folder = is_folder(job.local_path);
    if (!names_folder) return BACKUP_FAILED;
    if (*names_folder) local.folders.emplace_back(job.local_path);
    const auto command = rsync_transfer_command(job);
    if (!command) return BACKUP_FAILED;
    std::remove(transfer_file(job_name).c_str());
    if (keeps_snapshots(job)) {
        DebugLog("run rsync_snapshot_rotate() %s %d\n", job.local_path, job.inc_number);
        if (!are_folders(local.folders)) return BACKUP_FAILED;
        if (!rsync_snapshot_rotate(job.local_path, job.inc_number, job.job_name)) return BACKUP_FAILED;
        local.newest = snapshot_path(job.local_path, job.job_name, 0);
    }
    DebugLog("rsync_cmd = [%s]\n", command->c_str());
    rsync_set_job_state(job_name.text(), is_recover_run() ? JOB_RECOVER_RUNNING : JOB_RUNNING);
    const int code = transfer_with_retries(job_name, job, *command, local);
    if (!local.newest.empty()) {
        DebugLog("inc_root_path = [%s]\n", run_options.inc_root_path);
        if (!are_folders(local.folders)) return BACKUP_FAILED;
        utimensat(AT_FDCWD, run_options.inc_root_path, nullptr, AT_SYMLINK_NOFOLLOW);
        if (code == 0) write_out_and_mark_whole(local.newest);
    }
    return code == 0 ? BACKUP_DONE : BACKUP_FAILED;
}

} // namespace bakjob
