#pragma once

// Reader of an rsync daemon's configuration as the remote side writes it: a section header "[ NAME ]" at the
// start of its line, and "path = FOLDER" at the start of a later one. The text comes from elsewhere: names
// and folders are only data here.

#include "common/refusal.h"
#include "config/job.h"

#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace bakjob
{

// The name between the two inner blanks of a section header, or nullopt when the line has no brackets around
// one.
std::optional<std::string> section_name(std::string_view line);

// The folder of a path line, or nullopt when the line has no "path = ".
std::optional<std::string> path_of_line(std::string_view line);

// Reads a local copy of the configuration line by line, without trailing white space, until the visitor
// answers false. False when it cannot be opened.
bool read_daemon_config(const std::string &local_copy, const std::function<bool(const std::string &)> &line);

struct FetchedConfig {
    int exit_code; // of the command: what has come may do even when it is not 0
    Refusal why;   // there is no copy: a value is refused, it has gone, or it has 1 MiB or more
};

// Fetches the remote host's "/etc/rsyncd.conf" over ssh into `local_copy` and waits, up to about ten seconds,
// for the copy to be there. The caller removes the copy.
FetchedConfig fetch_daemon_config(const RsyncJob &job, const std::string &local_copy);

// The words for a fetch that ended with this code.
std::string not_fetched(int exit_code);

} // namespace bakjob
