#pragma once

// Files in folders that others may write to ("/tmp", "/var/run"): created exclusively, with their final mode,
// and never through a link that somebody put there.

#include "common/handles.h"

#include <string>
#include <string_view>
#include <sys/types.h>

namespace bakjob
{

// Creates the file and opens it for writing. An empty handle (errno) when something of that name exists or
// the file cannot be created.
UniqueFd create_file(const std::string &path, mode_t mode);

// Removes what is at `path`, even an empty folder, and creates the file with these contents. False (errno) on
// failure; a file that could not be written whole is removed.
bool replace_file(const std::string &path, mode_t mode, std::string_view contents);

// Whether the open file is the one at `path` now, and no later file of that name.
bool is_at(const std::string &path, int file);

// Opens an existing regular file that belongs to this user and has no second name; else an empty handle
// (errno). Never waits, not even for a pipe of that name.
UniqueFd open_own_file(const std::string &path, int flags);

// Whether `path` itself is a folder, and no link to one.
bool is_directory(const std::string &path);

} // namespace bakjob
