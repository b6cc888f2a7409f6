#pragma once

// Files that are replaced as a whole: a reader, or a crash, meets the old file or the new one.

#include "common/handles.h"

#include <string>
#include <string_view>
#include <sys/types.h>

namespace device
{

// Puts a file with these contents and this mode in the place of `path`, with the new one written to disk
// before the old one goes. The result is the new file, open; none on failure, with errno telling why and the
// old file as it was. Temporaries that processes which died left beside `path` are removed.
bakjob::UniqueFd replace_file(const std::string &path, std::string_view contents, mode_t mode);

// Reads an open file from where it stands to its end. False on failure, with errno telling why.
bool read_whole(int fd, std::string &contents);

} // namespace device
