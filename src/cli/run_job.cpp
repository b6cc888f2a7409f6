#include "cli/run_job.h"

#include "cli/broken_run.h"
#include "cli/recover_list.h"
#include "cli/run_processes.h"
#include "cli/source_folders.h"
#include "common/debug_log.h"
#include "common/interrupt.h"
#include "common/job_files.h"
#include "common/run_options.h"
#include "common/text.h"
#include "config/job_list.h"
#include "config/job_state.h"
#include "config/job_store.h"
#include "config/process_guard.h"
#include "platform/config_store.h"
#include "platform/device.h"
#include "transfer/backup.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <optional>
#include <system_error>
#include <vector>

namespace bakjob
{

namespace
{

constexpr int ALERT_LEVEL = 1;
constexpr std::size_t VOLUME_PREFIX_LENGTH = 14; // of "/mnt/HD/HD_a2/"

bool is_restore_run()
{
    return run_options.restore_mode == 1;
}

std::optional<RsyncJob> load_enabled_job(const JobName &name)
{
    std::optional<RsyncJob> copy;
    rsync_load_jobs();
    const RsyncJob *const job = rsync_find_job(name.text());
    if (job != nullptr && job->enable != 0) rsync_copy_job(copy.emplace(), *job);
    rsync_free_jobs();
    return copy;
}

// Silent refusals: nobody asked for this run now, or there is nothing to recover from.
bool is_due(const RsyncJob &job, bool force)
{
    if (job.schedule_mode == SCHEDULE_ONCE && job.state != JOB_IDLE && !force) return false;
    if (run_options.recover_seq == 0) return true;
    return job.inc_enable == 1 && rsync_list_snapshots(job.job_name) != 0;
}

PidFile take_pid_file(const JobName &name)
{
    PidFile file = rsync_write_pid_file(name);
    if (file.handle) return file;
    if (errno == EEXIST) {
        DebugLog("ERROR: rsync backup is running!\n");
    } else {
        DebugLog("ERROR: pid file [%s]: %s\n", file.path.c_str(), std::strerror(errno));
    }
    return file;
}

void raise_alert(const RsyncJob &job, bool done)
{
    rsync_alert_text(job);
    const int success = is_restore_run() ? ALERT_RESTORE_DONE : ALERT_FOLDER_DONE;
    const int failure = is_restore_run() ? ALERT_RESTORE_FAILED : ALERT_FOLDER_FAILED;
    fireAlert(ALERT_LEVEL, done ? success : failure, run_options.alert_text);
}

struct FolderPlace {
    std::string folder;
    int index; // from 1
    int count;
};

// `job` is a copy for this folder alone.
bool run_folder(RsyncJob job, const JobName &name, const std::optional<std::string> &root,
                const FolderPlace &place)
{
    copy_text(job.local_path, place.folder);
    bool done = root && rsync_resolve_folder(*root, place.folder) == 0;
    if (done) {
        rsync_write_progress(name, place.folder, place.index, place.count);
        done = rsync_set_ends(job, place.folder) && rsync_run_backup(name, job) == BACKUP_DONE;
    }
    raise_alert(job, done);
    return done;
}

bool run_folders(const RsyncJob &job, const JobName &name)
{
    const auto root = rsync_remote_root(name);
    RsyncJob to_split = job;
    FolderTable folders{};
    rsync_split_folders(to_split, folders);
    bool all_done = true;
    for (int i = 0; i < folders.count; ++i) {
        all_done &= run_folder(job, name, root, {folders.entries[i], i + 1, folders.count});
    }
    if (folders.left_out > 0) {
        DebugLog("ERROR: local_path refused: %d folders too many or too long\n", folders.left_out);
        raise_alert(job, false);
        all_done = false;
    }
    return all_done;
}

JobState final_state(const RsyncJob &job, bool outcome)
{
    if (outcome) return job.schedule_mode == SCHEDULE_EVENT ? JOB_DONE_SCHEDULED : JOB_DONE;
    return run_options.recover_seq != 0 ? JOB_RECOVER_FAILED : JOB_FAILED;
}

// A run that began while its job was being killed may have been killed, too.
void clear_dead_run(const JobName &name)
{
    const PidFile file = rsync_read_pid_file(name);
    if (file.process == 0 || is_running(file.process)) return;
    RunProcesses(file.process, false).end(0);
    rsync_remove_pid_file(file);
}

} // namespace

void rsync_alert_text(const RsyncJob &job)
{
    char device[128] = "";
    xml_get_str("/system_mgr/samba/netbios_name", sizeof device, device);
    std::string_view place = job.remote_path;
    if (job.backup_type == BACKUP_PULL) {
        place = job.local_path;
        place.remove_prefix(std::min(place.size(), VOLUME_PREFIX_LENGTH));
    }
    const std::string text = format_text("%s,%s,%s", job.job_name, device, place.data());
    copy_text(run_options.alert_text, text.substr(0, sizeof run_options.alert_text - 1));
}

bool rsync_run_job(const std::string &job_name, bool force, bool &outcome)
{
    const auto name = JobName::checked(job_name);
    if (name && !rsync_pid_file_absent(*name)) {
        DebugLog("ERROR: rsync backup is running!\n");
        return false;
    }
    auto job = name ? load_enabled_job(*name) : std::nullopt;
    if (!job) {
        DebugLog("ERROR: not found this job_name [%s] or disabled\n", job_name.c_str());
        return false;
    }
    if (!is_due(*job, force)) return false;
    if (is_restore_run()) job->backup_type = BACKUP_PULL;

    const std::vector<std::string> files = rsync_files_of_run(*name);
    const CatchInterrupts interrupts;
    const PidFile pid_file = take_pid_file(*name);
    if (!pid_file.handle) return false;
    try {
        rsync_set_job_state(job_name, JOB_STARTING);
        if (!run_folders(*job, *name)) outcome = false;
        rsync_set_job_state(job_name, final_state(*job, outcome));
    } catch (const Interrupted &) {
        rsync_end_broken_run(*name, pid_file, files);
        return false; // to whoever handles the signal; by default, nobody is left
    } catch (...) {
        rsync_end_broken_run(*name, pid_file, files);
        throw;
    }
    rsync_remove_pid_file(pid_file);
    return true;
}

void rsync_kill_job(const std::string &job_name)
{
    const auto name = JobName::checked(job_name);
    if (!name) {
        DebugLog("ERROR: job name refused: [%s]\n", job_name.c_str());
        return;
    }
    const PidFile file = rsync_read_pid_file(*name);
    std::optional<RunProcesses> started;
    try {
        if (file.process > 0) started.emplace(file.process, file.is_run);
    } catch (const std::system_error &why) {
        DebugLog("ERROR: what the run has started: %s\n", why.what());
    }
    if (rsync_kill_job_process(*name) == 0) std::puts("kill rsync job success .....");
    rsync_kill_transfers(*name);
    if (started) started->end(0);
    rsync_set_job_state(job_name, JOB_KILLED);
    rsync_remove_progress(*name);
    rsync_remove_pid_file(file);
    clear_dead_run(*name);
}

} // namespace bakjob
