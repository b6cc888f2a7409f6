#pragma once

// Finds out what the remote side of a job offers: the modules of its rsync daemon, their sizes and the
// room left on both sides, into the list of remote_modules.h.

#include "config/job.h"
#include "remote/reply.h"

#include <string>

namespace bakjob
{

// Fills the module list. Reports nothing: what could not be found out is missing or "N/A". A remote side that
// does not let us in takes the ssh client's own time-out; its configuration is waited for up to ten seconds
// more.
void discover_remote(const RsyncJob &job);

// Fills the list with the daemon's own listing, line by line, and the sizes of this device. The wait status
// of the listing command; 0 when it could not be started or its host is refused.
int list_daemon_modules(const RsyncJob &job);

// Whether the remote daemon's secrets hold the job's daemon password, in base64, for the user root: REPLY_OK,
// else REPLY_AUTH_FAILED, also when the host cannot be asked.
RemoteReplyCode check_remote_secret(const RsyncJob &job);

// The same for CurrentJob.
void rsync_discover_remote();
int rsync_list_daemon_modules();
RemoteReplyCode rsync_check_remote_secret();

// Adds a module of that name and path. One that does not fit its record is skipped, and so is what comes
// beyond 1024 modules.
void add_found_module(const std::string &name, const std::string &path);

// Adds the modules that a local copy of the remote daemon's configuration names with a path. False when it
// cannot be opened.
bool add_configured_modules(const std::string &local_copy);

// The module's name in a line of a daemon's listing: what stands in front of the first tab, without the
// blanks that pad it.
std::string module_of_listing_line(std::string line);

} // namespace bakjob
