#include "transfer/row_guard.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/run_options.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <optional>
#include <sys/stat.h>

namespace bakjob
{

namespace
{

constexpr mode_t NOTHING = 0;

// The type bits of what stands at the path, or NOTHING; none (errno) when that cannot be told.
std::optional<mode_t> type_at(const std::string &path)
{
    struct stat status = {};
    if (lstat(path.c_str(), &status) == 0) return status.st_mode & S_IFMT;
    if (errno == ENOENT || errno == ENOTDIR) return NOTHING;
    return std::nullopt;
}

void refuse(const std::string &path, const std::string &why)
{
    DebugLog("ERROR: local_path refused: [%s] %s\n", path.c_str(), why.c_str());
}

} // namespace

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
    const auto type = type_at(path);
    if (!type) return std::string("cannot be looked at: ") + std::strerror(errno);
    if (*type == NOTHING || *type == S_IFDIR) return "";
    return *type == S_IFLNK ? "is a link" : "is no folder";
}

std::optional<bool> is_folder(const std::string &path)
{
    if (const auto type = type_at(path)) return *type == S_IFDIR;
    refuse(path, why_no_folder(path));
    return std::nullopt;
}

bool are_folders(const std::vector<std::string> &paths)
{
    return std::all_of(paths.begin(), paths.end(), [](const std::string &path) {
        const std::string fault = why_no_folder(path);
        if (!fault.empty()) refuse(path, fault);
        return fault.empty();
    });
}

} // namespace bakjob
