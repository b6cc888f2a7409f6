// snapshots: those of a job, as a recover run numbers them.

#include "common/job_files.h"
#include "common/private_file.h"
#include "jobs/jobs.h"
#include "output/failure.h"
#include "output/output.h"
#include "recover/commands.h"
#include "transfer/snapshot_mark.h"

#include <array>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <nlohmann/json.hpp>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace bakjob::ctl
{

namespace
{

void require_snapshots(const RsyncJob &job)
{
    if (job.backup_type != BACKUP_PULL || job.inc_enable != 1 || job.enable != 1) {
        throw Failure(
            "the job keeps no snapshots: that takes enable=yes, backup_type=pull and inc_enable=yes");
    }
    if (std::strchr(job.local_path, ':') != nullptr) {
        throw Failure("the job has several folders; bakjob recovers snapshots of jobs with one");
    }
}

std::string time_of(const std::string &path)
{
    struct stat status = {};
    std::array<char, 32> time{};
    std::tm local{};
    if (stat(path.c_str(), &status) != 0 || localtime_r(&status.st_mtime, &local) == nullptr) return "";
    std::strftime(time.data(), time.size(), "%Y-%m-%d %H:%M:%S", &local);
    return time.data();
}

} // namespace

int show_snapshots(const Request &request)
{
    const RsyncJob job = read_job(request.name).record;
    require_snapshots(job);
    std::vector<Row> rows;
    Json list = Json::array();
    // By their names: bakjob's own listing takes whatever begins so, and no more than ten.
    for (int number = 1; number <= MAX_SNAPSHOTS; ++number) {
        const std::string path = snapshot_path(job.local_path, job.job_name, number - 1);
        if (!is_directory(path)) continue;
        // What a part of the files lacks, a recover run deletes at the remote side.
        const bool complete = is_marked_whole(path);
        const std::string time = time_of(path);
        const std::string command =
            complete ? "bakjob -n " + std::to_string(number) + " -r " + name_for_shell(request.name) : "";
        rows.push_back({std::to_string(number), time, complete ? "yes" : "not known", path, command});
        list.push_back({{"number", number},
                        {"time", time},
                        {"path", path},
                        {"complete", complete},
                        {"recover", complete ? Json(command) : Json()}});
    }
    if (request.json) {
        print_json(list);
    } else if (rows.empty()) {
        std::puts("There are none yet.");
    } else {
        print_table({"NUMBER", "TIME", "COMPLETE", "PATH", "RECOVERED TO THE REMOTE SIDE BY"}, rows);
    }
    return EXIT_FINE;
}

} // namespace bakjob::ctl
