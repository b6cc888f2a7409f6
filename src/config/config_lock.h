#pragma once

// Exclusive locks on files. Every writer of the job list holds that of the configuration from its load to its
// copy to flash; nobody holds it during a transfer.
//
// A lock file lies in a folder where others may write, and no other user may hold the lock or hide it. So it
// is a regular file of this user's with one name and mode 0600. A file with another mode gets that mode and
// is waited for: an older program may hold it. Anything else at its name is moved aside, to
// PATH.aside.PID.NUMBER, and the lock file is created again.

#include "common/handles.h"
#include "config/lock_holder.h"

namespace bakjob
{

// Waits for the lock and takes it; closing the handle releases it. An empty handle, errno and a trace when
// the lock file cannot be created, or others replace it faster than that. Most callers then go on without.
[[nodiscard]] UniqueFd rsync_lock_config(const char *path);

// Calls `tell` once in each wait that lasts a second, with the lock's path and its holder, if that is known.
// Null, as at the start: no call.
using LockWait = void (*)(const char *path, const std::optional<LockHolder> &holder);
void rsync_tell_lock_waits(LockWait tell);

} // namespace bakjob
