#include "transfer/row_guard.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/run_options.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <sys/stat.h>

namespace bakjob
{

bool keeps_snapshots(const RsyncJob &job)
{
    return job.inc_enable == 1 && run_options.recover_seq == 0 && job.backup_type == BACKUP_PULL;
}

std::vector<std::string> snapshots_in_use(const RsyncJob &job)
{
    std::vector<std::string> paths;
    if (run_options.recover_seq != 0) {
        paths.push_back(
            snapshot_path(job.local_path, job.job_name, std::int64_t{run_options.recover_seq} - 1));
    }
    for (int number = 0; keeps_snapshots(job) && number < snapshots_kept(job.inc_number); ++number) {
        paths.push_back(snapshot_path(job.local_path, job.job_name, number));
    }
    return paths;
}

std::string why_no_folder(const std::string &path)
{
    struct stat status = {};
    if (lstat(path.c_str(), &status) != 0) {
        const bool missing = errno == ENOENT || errno == ENOTDIR;
        return missing ? "" : std::string("cannot be looked at: ") + std::strerror(errno);
    }
    if (S_ISDIR(status.st_mode)) return "";
    return S_ISLNK(status.st_mode) ? "is a link" : "is no folder";
}

bool are_folders(const std::vector<std::string> &paths)
{
    return std::all_of(paths.begin(), paths.end(), [](const std::string &path) {
        const std::string fault = why_no_folder(path);
        if (!fault.empty()) DebugLog("ERROR: local_path refused: [%s] %s\n", path.c_str(), fault.c_str());
        return fault.empty();
    });
}

} // namespace bakjob
