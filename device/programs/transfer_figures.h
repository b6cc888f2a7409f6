#pragma once

// Runs the stock rsync for a job and publishes its figures: what a dry run would move in
// "/tmp/r_JOB.dump_size", what a transfer has moved so far in "/tmp/r_JOB". Their layout is described in
// bakjob-config(5).

#include "stock_program.h"

#include <string>
#include <vector>

// `arguments` are those of the stock program, its name first. Waits for its end; its exit status, 128 and the
// signal's number when one ended it. Figures that cannot be written do not stop the transfer.
int run_with_figures(const StockProgram &rsync, const std::string &job_name,
                     std::vector<std::string> arguments);
