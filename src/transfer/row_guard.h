#pragma once

// What commands that run as root must not find in a job's folder: users of the share may put a link there,
// and the files behind it would be sent, moved or deleted.

#include "config/job.h"

#include <optional>
#include <string>
#include <vector>

namespace bakjob
{

// Whether the run moves the job's snapshots up and writes into the newest.
bool keeps_snapshots(const RsyncJob &job);

// The snapshots that the run uses: the whole row when it moves up, the one that a recover run sends, else
// none.
std::vector<std::string> snapshots_in_use(const RsyncJob &job);

// What is wrong with a path at which a folder must stand, or nothing; empty when that is so.
std::string why_no_folder(const std::string &path);

// Whether a folder stands there. Nothing, with a trace, when that cannot be told: one that passes for a file
// would be copied to another place.
std::optional<bool> is_folder(const std::string &path);

// False, with a trace that names it, when one of the paths is not so.
bool are_folders(const std::vector<std::string> &paths);

} // namespace bakjob
