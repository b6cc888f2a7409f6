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
constexpr std::size_t VOLUME_PREFIX_LENGTH = VOLUMES_FOLDER.size() + VOLUME_LENGTH + 1; // with a slash

std::optional<RsyncJob> load_enabled_job(const JobName &name)
{
    std::optional<RsyncJob> copy;
    rsync_load_jobs();
    const RsyncJob *const job = rsync_find_job(name.text());
    if (job != nullptr && job->enable != 0) rsync_copy_job(copy.emplace(), *job);
    rsync_free_jobs();
    return copy;
}

// Without a trace: nobody asked for this run now, or there is nothing to recover from.
Refusal refusal_now(const RsyncJob &job, bool force)
{
    if (job.schedule_mode == SCHEDULE_ONCE && job.state != JOB_IDLE && !force)
        return {"it runs once, and has"};
    if (!is_recover_run() || (job.inc_enable == 1 && rsync_list_snapshots(job.job_name) != 0)) return {};
    return {"there is no snapshot to recover"};
}

Refusal refusal_of_pid_file(const PidFile &file)
{
    if (errno == EEXIST) return trace_refusal("rsync backup is running!");
    return trace_refusal("pid file [" + file.path + "]: " + std::strerror(errno));
}

RunReport not_started(const Refusal &refusal)
{
    return {{}, {.step = RunStep::START, .seen = refusal.why}};
}

std::string alert_text_of(const RsyncJob &job)
{
    char device[128] = "";
    xml_get_str("/system_mgr/samba/netbios_name", sizeof device, device);
    std::string_view place = job.remote_path;
    if (job.backup_type == BACKUP_PULL) {
        place = job.local_path;
        place.remove_prefix(std::min(place.size(), VOLUME_PREFIX_LENGTH));
    }
    return format_text("%s,%s,%s", job.job_name, device, place.data());
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

FolderOutcome not_begun(const Refusal &refusal)
{
    return {BACKUP_FAILED, {.step = RunStep::FOLDER, .seen = refusal.why}};
}

// Leaves `job` as that of this folder alone, for the alert.
FolderOutcome transfer_into_place(RsyncJob &job, const JobName &name, const Checked &root,
                                  const FolderPlace &place)
{
    copy_text(job.local_path, place.folder); // for the alert
    if (!root) return not_begun(root.refusal());
    if (const Refusal refusal = enter_share(*root, place.folder)) return not_begun(refusal);
    rsync_write_progress(name, place.folder, place.index, place.count);
    if (const Refusal refusal = set_ends(job, place.folder)) return not_begun(refusal);
    return transfer_folder(name, job);
}

// `job` is a copy for this folder alone.
FolderOutcome run_folder(RsyncJob job, const JobName &name, const Checked &root, const FolderPlace &place)
{
    FolderOutcome outcome = transfer_into_place(job, name, root, place);
    outcome.reason.folder = place.folder;
    raise_alert(job, outcome.result == BACKUP_DONE);
    return outcome;
}

std::vector<FolderOutcome> run_folders(const RsyncJob &job, const JobName &name)
{
    const Checked root = rsync_remote_root(name);
    RsyncJob to_split = job;
    FolderTable folders{};
    rsync_split_folders(to_split, folders);
    std::vector<FolderOutcome> outcomes;
    outcomes.reserve(FolderTable::SIZE + 1);
    for (int i = 0; i < folders.count; ++i) {
        outcomes.push_back(run_folder(job, name, root, {folders.entries[i], i + 1, folders.count}));
    }
    if (folders.left_out > 0) {
        outcomes.push_back(not_begun(
            refused("local_path", format_text("%d folders too many or too long", folders.left_out))));
        raise_alert(job, false);
    }
    return outcomes;
}

JobState final_state(const RsyncJob &job, bool outcome)
{
    if (outcome) return job.schedule_mode == SCHEDULE_EVENT ? JOB_DONE_SCHEDULED : JOB_DONE;
    return is_recover_run() ? JOB_RECOVER_FAILED : JOB_FAILED;
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
    copy_text(run_options.alert_text, alert_text_of(job).substr(0, sizeof run_options.alert_text - 1));
}

bool RunReport::all_done() const
{
    return std::all_of(folders.begin(), folders.end(),
                       [](const FolderOutcome &folder) { return folder.result == BACKUP_DONE; });
}

RunReport run_job(const std::string &job_name, bool force, bool all_done_before)
{
    const auto name = JobName::checked(job_name);
    if (name && !rsync_pid_file_absent(*name)) return not_started(trace_refusal("rsync backup is running!"));
    auto job = name ? load_enabled_job(*name) : std::nullopt;
    if (!job) return not_started(trace_refusal("not found this job_name [" + job_name + "] or disabled"));
    if (const Refusal refusal = refusal_now(*job, force)) return not_started(refusal);
    if (is_restore_run()) job->backup_type = BACKUP_PULL;

    const std::vector<std::string> files = rsync_files_of_run(*name);
    const CatchInterrupts interrupts;
    const PidFile pid_file = rsync_write_pid_file(*name);
    if (!pid_file.handle) return not_started(refusal_of_pid_file(pid_file));
    RunReport report;
    try {
        rsync_set_job_state(job_name, JOB_STARTING);
        report.folders = run_folders(*job, *name);
        rsync_set_job_state(job_name, final_state(*job, all_done_before && report.all_done()));
    } catch (const Interrupted &) {
        rsync_end_broken_run(*name, pid_file, files);
        // To whoever handles the signal; by default, nobody is left.
        report.reason = {.step = RunStep::INTERRUPTED, .seen = "a signal"};
        return report;
    } catch (...) {
        rsync_end_broken_run(*name, pid_file, files);
        throw;
    }
    rsync_remove_pid_file(pid_file);
    return report;
}

bool rsync_run_job(const std::string &job_name, bool force, bool &outcome)
{
    const RunReport report = run_job(job_name, force, outcome);
    outcome = outcome && report.all_done();
    return !report.reason;
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
