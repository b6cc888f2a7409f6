#pragma once

namespace bakjob
{

// What a program does first, for it may have been started by anybody, with anything closed or ignored: opens
// standard handles that are closed, so that no file opened later becomes one of them, and has the exit codes
// of its commands kept for it.
void rsync_prepare_process();

} // namespace bakjob
