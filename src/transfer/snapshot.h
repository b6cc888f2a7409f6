#pragma once

// The row of snapshot folders of an incremental job: number 0 is the newest and the destination of the next
// transfer, higher numbers are older and share unchanged files with it by hard links.

#include <string>

namespace bakjob
{

// What a rotation runs for snapshot `number` of a row that ends at `top`: the oldest is removed, 0 is copied
// to 1 by hard links, the others move up by one. The folder is already escaped.
std::string rotation_command(const std::string &escaped_folder, const std::string &job_name, int number,
                             int top);

// Rotates the snapshots in `local_path` (`inc_number` of them, brought within 3 to 10), each with its times
// and its mark (snapshot_mark.h), and sets `inc_root_path` to snapshot 0. Nothing is done when the path is
// empty or refused. A step that fails is traced, what it leaves is not marked, and the others are done. False
// when nothing may be transferred now: a link or a file stands in the row, or a mark that must go stays.
bool rsync_snapshot_rotate(const std::string &local_path, int inc_number, const std::string &job_name);

} // namespace bakjob
