#pragma once

// How the appliance's rsync and ssh run the stock programs behind them.

#include <string>
#include <vector>

struct StockProgram {
    const char *name; // in messages
    const char *path;
    int failed;    // exit status when it cannot be run
    int timed_out; // and when it has run too long
};

// Becomes the program with these arguments, its name first. Comes back only when that fails, with the exit
// status.
int become_stock(const StockProgram &program, const std::vector<std::string> &arguments);

// Whether this process belongs to a probe: a command of the job module that moves no job's data.
bool is_probe();

// The same as become_stock for what may be a probe. A probe may take 2 minutes in all, whatever the far end
// does; DEVICE_PROBE_SECONDS in the environment is another bound. Then it and all that it has started are
// killed. What it had printed by then stands. The exit status, or death by the same signal, is the program's.
int run_stock(const StockProgram &program, const std::vector<std::string> &arguments);

// What is started from here on belongs to a job's transfer.
void mark_transfer();
