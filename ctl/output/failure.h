#pragma once

// A command that cannot be carried out throws a Failure, whose text goes to standard error.

#include <stdexcept>

namespace bakjob::ctl
{

// The exit statuses of every command.
enum ExitStatus : int {
    EXIT_FINE = 0,
    EXIT_TROUBLE = 1, // carried out: a job has failed, or a run of it would
    EXIT_RUNNING = 2, // carried out: a run is going on
    EXIT_REFUSED = 3  // not carried out; nothing was changed
};

struct Failure : std::runtime_error {
    using std::runtime_error::runtime_error;
};

} // namespace bakjob::ctl
