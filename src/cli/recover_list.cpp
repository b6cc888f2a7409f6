#include "cli/recover_list.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/run_options.h"
#include "common/text.h"
#include "config/config_lock.h"
#include "config/job_list.h"
#include "config/job_store.h"

#include <cstdlib>
#include <ctime>
#include <dirent.h>
#include <sys/stat.h>
#include <unistd.h>

namespace bakjob
{

RecoverList recover_list{};

namespace
{

// The local folder of a job that keeps snapshots; empty for any other.
std::string snapshot_folder(const std::string &job_name)
{
    {
        const UniqueFd lock = rsync_lock_config(CONFIG_LOCK_FILE);
        rsync_load_jobs();
    }
    std::string folder;
    const RsyncJob *const job = rsync_find_job(job_name);
    if (job != nullptr && job->backup_type == BACKUP_PULL && job->inc_enable == 1 && job->enable == 1) {
        folder = job->local_path;
    }
    rsync_free_jobs();
    return folder;
}

void add_entry(const std::string &path, const struct stat &status)
{
    RecoverEntry &entry = recover_list.entries[recover_list.count++];
    entry.seq = recover_list.count;
    char time[64] = "";
    std::tm local{};
    if (localtime_r(&status.st_mtime, &local) != nullptr) {
        std::strftime(time, sizeof time, "%Y-%m-%d %H:%M:%S", &local);
    }
    trim_right(time);
    copy_text(entry.time, time);
    copy_text(entry.path, path);
    DebugLog("[%d. %s: %s]\n", entry.seq, entry.time, path.c_str());
}

} // namespace

int rsync_list_snapshots(const std::string &job_name)
{
    if (run_options.snapshot_prefix[0] == '\0') copy_text(run_options.snapshot_prefix, job_name);
    const std::string folder = snapshot_folder(job_name);
    if (folder.empty() || access(folder.c_str(), F_OK) != 0) return 0;
    rsync_clear_snapshot_list();
    if (!copy_text(recover_list.job_name, job_name) || !copy_text(recover_list.dir, folder)) return 0;

    dirent **names = nullptr;
    const int found = scandir(recover_list.dir, &names, rsync_snapshot_filter, alphasort);
    for (int i = 0; i < found; ++i) {
        const std::string path = folder + '/' + names[i]->d_name;
        struct stat status = {};
        const bool is_folder = stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
        if (is_folder && recover_list.count < RecoverList::SIZE) add_entry(path, status);
        std::free(names[i]);
    }
    std::free(names);
    if (found <= 0) return 0;
    DebugLog("scan file num [%d]\n", recover_list.count);
    return 1;
}

void rsync_clear_snapshot_list()
{
    recover_list = {};
}

int rsync_snapshot_filter(const dirent *entry)
{
    return is_snapshot_name(run_options.snapshot_prefix, entry->d_name) ? 1 : 0;
}

} // namespace bakjob
