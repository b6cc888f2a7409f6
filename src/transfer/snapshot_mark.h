#pragma once

// The mark of a snapshot that is known to be whole: an extended attribute of its folder, which only root can
// set. It holds the folder's name, so a copy that takes it along, of whatever part of the files, is not
// marked by it. A file system without extended attributes keeps none: there nothing is known to be whole.

#include "common/refusal.h"

#include <string>

namespace bakjob
{

inline constexpr const char *SNAPSHOT_MARK = "trusted.bakjob.complete";

bool is_marked_whole(const std::string &snapshot);

// Whether the file system of a folder can keep marks.
bool keeps_marks(const std::string &folder);

// Marks the folder, not one behind a link. False when it cannot be; with a trace, unless there is no folder,
// the file system keeps no marks, or this process may set none.
bool mark_whole(const std::string &snapshot);

// The same, once what was written to the file system is on its disk: a power cut must not leave a marked
// folder with empty files.
bool write_out_and_mark_whole(const std::string &snapshot);

// Takes the mark away, whatever it says. A refusal when it is still there.
Refusal take_mark_away(const std::string &snapshot);

} // namespace bakjob
