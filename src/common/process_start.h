#pragma once

namespace bakjob
{

// What a program does first, as its caller may have closed or ignored anything: opens standard handles that
// are closed, so that no file opened later becomes one of them, and no longer ignores the end of its
// commands, so that it gets their exit codes.
void rsync_prepare_process();

} // namespace bakjob
