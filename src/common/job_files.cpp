#include "common/job_files.h"

namespace bakjob
{

namespace
{

std::string named_after(std::string_view prefix, std::string_view job_name, std::string_view suffix = {})
{
    std::string name(prefix);
    name += job_name;
    name += suffix;
    return name;
}

std::string snapshot_prefix(std::string_view job_name)
{
    return named_after(job_name.empty() ? "backup" : job_name, ".");
}

} // namespace

std::string pid_file(const JobName &job)
{
    return named_after("/var/run/bakjob_", job.text(), ".pid");
}

std::string password_file(const JobName &job)
{
    return named_after("/tmp/r_", job.text(), ".passwd");
}

std::string progress_file(const JobName &job)
{
    return named_after("/tmp/rsync_bakcup_src_folder_name.", job.text());
}

std::string unrecorded_file(const JobName &job)
{
    return named_after("/var/run/bakjob_", job.text(), ".unrecorded");
}

std::string transfer_file(const JobName &job)
{
    return named_after("/tmp/r_", job.text());
}

std::string transfer_size_file(const JobName &job)
{
    return named_after("/tmp/r_", job.text(), ".dump_size");
}

std::string remote_config_copy(const JobName &job)
{
    return named_after("/tmp/remote_rshareinfo_", job.text(), ".txt");
}

std::string snapshot_name(std::string_view job_name, std::int64_t number)
{
    return snapshot_prefix(job_name) + std::to_string(number);
}

std::string snapshot_path(std::string_view folder, std::string_view job_name, std::int64_t number)
{
    return std::string(folder) + '/' + snapshot_name(job_name, number);
}

bool is_snapshot_name(std::string_view job_name, std::string_view entry)
{
    return entry != "." && entry != ".." && entry.starts_with(snapshot_prefix(job_name));
}

} // namespace bakjob
