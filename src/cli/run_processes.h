#pragma once

// What a run has started and what that has started in turn, wherever it has got to: known by the mark in its
// environment (shell.h) and by descent.

#include "common/processes.h"

#include <string>
#include <sys/types.h>
#include <vector>

namespace bakjob
{

class RunProcesses
{
public:
    // Looks at once. `is_the_run`: whether the process of that id is, or was, the run, and belongs to it.
    // Otherwise another process has got the id, and what that one started is spared.
    RunProcesses(pid_t run, bool is_the_run);

    // Ends all of them and whatever they start meanwhile; never this process. Sends SIGTERM, after `grace`
    // seconds SIGKILL; with a grace of 0, SIGKILL at once. What even that does not end within 5 seconds is
    // traced and left.
    void end(int grace);

private:
    void look_again();
    bool end_within(int seconds, int number);

    std::string mark_;
    std::vector<Process> found_;
    std::vector<Process> spared_;
};

} // namespace bakjob
