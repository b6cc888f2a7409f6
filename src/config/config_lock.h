#pragma once

// The exclusive lock that every writer of the job list holds from its load to its flash commit, and others of
// its kind. It is never held during a transfer.
//
// A lock file lies where others may write, and nobody else must be able to hold the lock or to hide it. It is
// a regular file of this user's with one name and mode 0600. One of another mode gets that mode, and is
// waited for: an older program may hold it. Whatever else stands at its name is moved aside, to
// PATH.aside.PID.NUMBER, and the file made anew.

#include "common/handles.h"
#include "config/lock_holder.h"

namespace bakjob
{

// Waits for the lock and takes it; closing the handle releases it. No handle, and errno, when there is none
// to be had: the lock file cannot be made, or others replace it faster than it is made. Then the trace says
// so, and the caller goes on without unless it has a reason not to.
[[nodiscard]] UniqueFd rsync_lock_config(const char *path);

// Has `tell` called when a wait for a lock has lasted a second, once in each wait, with the lock's path and
// who holds it, if that is known. Null, as at the start: nobody is told.
using LockWait = void (*)(const char *path, const std::optional<LockHolder> &holder);
void rsync_tell_lock_waits(LockWait tell);

} // namespace bakjob
