#pragma once

// Reader of an rsync daemon's configuration as the remote side writes it: a section header "[ NAME ]" at the
// start of its line, and "path = FOLDER" at the start of a later one. The text comes from elsewhere: names
// and folders are only data here.

#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace bakjob
{

// The name between the two inner blanks of a section header, or nothing when the line has no brackets around
// one.
std::optional<std::string> section_name(std::string_view line);

// The folder of a path line, or nothing when the line has no "path = ".
std::optional<std::string> path_of_line(std::string_view line);

// Reads a local copy of the configuration line by line, without trailing white space, until the visitor
// answers false. False when it cannot be opened.
bool read_daemon_config(const std::string &local_copy, const std::function<bool(const std::string &)> &line);

// Fetches the remote host's "/etc/rsyncd.conf" over ssh into `local_copy` (CurrentJob's host and password)
// and waits, up to about ten seconds, for the copy to be there. False when it is not, or a value is refused,
// or it has 1 MiB or more, of which no more is fetched. The caller removes the copy.
bool fetch_daemon_config(const std::string &local_copy);

} // namespace bakjob
