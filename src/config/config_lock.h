#pragma once

// The exclusive lock that every writer of the job list holds from its load to its flash commit. It is never
// held during a transfer.

#include "common/handles.h"

namespace bakjob
{

// Waits for the lock and takes it; closing the handle releases it. No handle when the lock file cannot be
// opened or made: the caller goes on without.
[[nodiscard]] UniqueFd rsync_lock_config(const char *path);

} // namespace bakjob
