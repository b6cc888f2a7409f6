#pragma once

// A job whose runs wait where they are told to, and a look at what a run left.

#include "soak_support.h"

// Where a run can be held up: in the place of a program, a script that touches /tmp/there and then waits,
// with a child in a session of its own whose parent has gone.
struct Phase {
    const char *name;
    std::string program;
    std::string script;
};
std::vector<Phase> phases();

// In the place of rsync: a run that is held up in its first probe until there is a file /tmp/go.
inline const std::string UNTIL_GO =
    KIND_OF_CALL + "[ $kind != list ] || { touch /tmp/there; until [ -e /tmp/go ]; do sleep 0.05; done; }\n";

// The ids of processes that the module has started, and of those that wait for a phase's end.
std::string left_processes();

// Ends those that wait.
void end_waits();

// Starts a run with arguments and signals as they are, and waits until it is held up.
pid_t start_until_there(const std::vector<std::string> &arguments);

// The result of wait_for, and -1 when it has not ended within so many seconds and is killed.
int result_within(pid_t process, int seconds);

// What an ended run must not leave; empty when all is well.
std::string left_files();

// While this lives: a job "daily" that fetches with snapshots, from a remote side that answers well. When it
// goes, so does what waits for a phase's end.
class JobToHoldUp
{
public:
    explicit JobToHoldUp(const Keys &keys = {});
    JobToHoldUp(const JobToHoldUp &) = delete;
    JobToHoldUp &operator=(const JobToHoldUp &) = delete;
    ~JobToHoldUp();
};

// Whether a run without any delay is done and leaves what a run leaves, which is then removed.
bool next_run_works();
