// snapshots: those of a job, as a recover run numbers them.

#include "cli/recover_list.h"
#include "commands.h"
#include "common/job_files.h"
#include "failure.h"
#include "jobs.h"
#include "output.h"
#include "transfer/snapshot_mark.h"

#include <cstdio>
#include <cstring>
#include <nlohmann/json.hpp>
#include <optional>

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

// The number that -n takes for the snapshot; nothing for a folder that only looks like one.
std::optional<int> recover_number(const RecoverEntry &entry)
{
    const std::string path = entry.path;
    for (int number = 0; number < RecoverList::SIZE; ++number) {
        if (path.ends_with('/' + snapshot_name(recover_list.job_name, number))) return number + 1;
    }
    return std::nullopt;
}

} // namespace

int show_snapshots(const Request &request)
{
    require_snapshots(read_job(request.name).record);
    const int found = rsync_list_snapshots(request.name);
    std::vector<Row> rows;
    Json list = Json::array();
    for (int i = 0; found != 0 && i < recover_list.count; ++i) {
        const RecoverEntry &entry = recover_list.entries[i];
        const auto number = recover_number(entry);
        if (!number) continue;
        // What a part of the files lacks, a recover run deletes at the remote side.
        const bool complete = is_marked_whole(entry.path);
        const std::string command =
            complete ? "bakjob -n " + std::to_string(*number) + " -r " + name_for_shell(request.name) : "";
        rows.push_back(
            {std::to_string(*number), entry.time, complete ? "yes" : "not known", entry.path, command});
        list.push_back({{"number", *number},
                        {"time", entry.time},
                        {"path", entry.path},
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
