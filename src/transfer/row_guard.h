#pragma once

// What commands that run as root must not find in a job's folder: users of the share may put a link there,
// and the files behind it would be sent, moved or deleted.

#include "common/refusal.h"
#include "config/job.h"

#include <string>
#include <vector>

namespace bakjob
{

// Whether the run moves the job's snapshots up and writes into the newest.
bool keeps_snapshots(const RsyncJob &job);

// The snapshots that the run uses: the whole row when it moves up, the one that a recover run sends, else
// none.
std::vector<std::string> snapshots_in_use(const RsyncJob &job);

// Why something else than a folder stands at the path, in words; empty when a folder or nothing does.
std::string why_no_folder(const std::string &path);

// What stands at a path. Refused when that cannot be told: a folder that passes for a file would be copied to
// another place.
struct Place {
    bool is_folder;
    Refusal refusal;
};
Place look_at(const std::string &path);

// Names the first path at which something else than a folder stands.
Refusal refusal_of_row(const std::vector<std::string> &paths);

} // namespace bakjob
