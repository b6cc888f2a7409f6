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
    bakjob::UniqueFd file; // the new one, open; none: it failed (errno) and the old file is as it was
    bool on_disk = false;  // false with a file: its folder could not be synced (errno)
};

// Puts a file with these contents in the place of `path`, with the new one written to disk before the old one
// goes. Temporaries that processes which died left beside `path` are removed.
Replaced replace_file(const std::string &path, std::string_view contents, const FileOwner &owner);

// Reads an open file from where it stands to its end. False on failure, with errno telling why.
bool read_whole(int fd, std::string &contents);

} // namespace device
