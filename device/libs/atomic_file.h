#pragma once

// Files that are replaced as a whole: a reader, or a crash, meets the old file or the new one.

#include "common/handles.h"

#include <string>
#include <string_view>
#include <sys/types.h>

namespace device
{

struct FileOwner {
    mode_t mode;
    uid_t user = 0;
    gid_t group = 0;
};

struct Replaced {
    bakjob::UniqueFd file; // the new file, open; empty: that failed (errno) and the old file is as it was
    bool on_disk = false;  // false with a file: its folder could not be synced (errno)
};

// Replaces the file at `path`. The new one is on disk before the old one goes. Temporary files that dead
// processes left beside `path` are removed.
Replaced replace_file(const std::string &path, std::string_view contents, const FileOwner &owner);

// Reads an open file from its present position to its end. False (errno) on failure.
bool read_whole(int fd, std::string &contents);

} // namespace device
