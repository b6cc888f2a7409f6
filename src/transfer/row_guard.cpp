#include "transfer/row_guard.h"

#include "common/job_files.h"
#include "common/run_options.h"

#include <cerrno>
#include <cstring>
#include <optional>
#include <sys/stat.h>

namespace bakjob
{

namespace
{

constexpr mode_t NOTHING = 0;

// The type bits of what stands at the path, or NOTHING; nullopt (errno) when that cannot be told.
std::optional<mode_t> type_at(const std::string &path)
{
    struct stat status = {};
    if (lstat(path.c_str(), &status) == 0) return status.st_mode & S_IFMT;
    if (errno == ENOENT || errno == ENOTDIR) return NOTHING;
    return std::nullopt;
}

Refusal refusal_at(const std::string &path, const std::string &why)
{
    return refused("local_path", '[' + path + "] " + why);
}

} // namespace

bool keeps_snapshots(const RsyncJob &job)
{
    return job.inc_enable == 1 && !is_recover_run() && job.backup_type == BACKUP_PULL;
}

std::vector<std::string> snapshots_in_use(const RsyncJob &job)
{
    std::vector<std::string> paths;
    if (is_recover_run()) {
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

Place look_at(const std::string &path)
{
    if (const auto type = type_at(path)) return {*type == S_IFDIR, {}};
    return {false, refusal_at(path, why_no_folder(path))};
}

Refusal refusal_of_row(const std::vector<std::string> &paths)
{
    for (const std::string &path : paths) {
        const std::string fault = why_no_folder(path);
        if (!fault.empty()) return refusal_at(path, fault);
    }
    return {};
}

} // namespace bakjob
