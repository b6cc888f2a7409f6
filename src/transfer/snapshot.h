#pragma once

// The row of snapshot folders of an incremental job: number 0 is the newest and the destination of the next
// transfer, higher numbers are older and share unchanged files with it by hard links.

#include "common/refusal.h"

#include <string>
#include <vector>

namespace bakjob
{

// What a rotation runs for snapshot `number` of a row that ends at `top`: the oldest is removed, 0 is copied
// to 1 by hard links, the others move up by one. The folder is already escaped.
std::string rotation_command(const std::string &escaped_folder, const std::string &job_name, int number,
                             int top);

struct RotationStep {
    int number;
    std::string from;
    std::string to;      // empty for the oldest, which is removed
    std::string command; // empty: there is no such snapshot

    [[nodiscard]] bool copies() const { return number == 0; } // and leaves `from` as it is
};

// The rotation of the snapshots in `local_path` (`inc_number` of them, brought within 3 to 10), from the
// oldest to 0. Empty when the path is empty or refused.
std::vector<RotationStep> plan_rotation(const std::string &local_path, int inc_number,
                                        const std::string &job_name);

// Carries it out; each snapshot takes its times and its mark (snapshot_mark.h) along. A step that fails is
// traced, what it leaves is not marked, and the others are done. A refusal when nothing may be transferred
// now: a link or a file stands in the row, or a mark that must go stays.
Refusal rotate(const std::vector<RotationStep> &steps);

// Both, with `inc_root_path` set to snapshot 0. False when nothing may be transferred.
bool rsync_snapshot_rotate(const std::string &local_path, int inc_number, const std::string &job_name);

} // namespace bakjob
