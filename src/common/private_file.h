#pragma once

// Files in folders that others may write to ("/tmp", "/var/run"): made exclusively, with their final mode,
// and never through a link that somebody put there.

#include "common/handles.h"

#include <string>
#include <string_view>
#include <sys/types.h>

namespace bakjob
{

// Makes the file and opens it for writing; no descriptor (and errno) when anything of that name exists or it
// cannot be made.
UniqueFd create_file(const std::string &path, mode_t mode);

// Removes what stands at `path`, be it an empty folder, makes the file anew and writes `contents`. False
// (errno) on failure; a file that could not be written whole is removed.
bool replace_file(const std::string &path, mode_t mode, std::string_view contents);

// Whether the open file is the one that stands at `path`, not one of that name that came later.
bool is_at(const std::string &path, int file);

// Opens an existing regular file that belongs to this user and has no second name. Never waits, not even for
// a pipe of that name. No descriptor (errno) otherwise.
UniqueFd open_own_file(const std::string &path, int flags);

// Whether a folder stands at `path` itself, not behind a link.
bool is_directory(const std::string &path);

} // namespace bakjob
