#pragma once

// Small operations on local paths that the module offers beside the run, and the file that gives volumes
// their shared names.

#include <string>
#include <string_view>

namespace bakjob
{

// Makes a folder, with those above it, open to every user. The wait status of the command; -1 for an empty or
// refused path.
int rsync_make_dir(const std::string &path);

// 1 when a folder stands at `path` itself, else 0, also for a link to one.
int rsync_is_dir(const std::string &path);

// 1 when the path's third component occurs in some line of "/etc/shared_name", else 0.
int rsync_volume_is_shared(const std::string &path);

// The path, "/mnt/HD/" and a volume of five characters in front, with the shared name of its volume instead;
// empty when the volume has none or the result does not fit 1023 bytes. Stays valid until the next call.
const char *rsync_shared_path(const std::string &path);

// The first word of a line of that file; empty when it is longer than 63 bytes.
std::string shared_name_of_line(std::string_view line);

} // namespace bakjob
