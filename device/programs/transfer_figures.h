#pragma once

// Runs the stock rsync for a job and publishes its figures: how far it is in "/tmp/r_JOB", and at the end
// what it has moved in all in "/tmp/r_JOB.dump_size". Their layout is described in bakjob-config(5).
//
// rsync makes its whole list of files first, so that there is a whole to be a share of. The list takes memory
// at both ends. Above 1,500,000 files it is made piece by piece, as rsync would by itself; then the whole is
// not known before the last piece. DEVICE_MOST_LISTED in the environment is another bound.

#include "stock_program.h"

#include <string>
#include <vector>

// The total of an earlier transfer is none of the next one's.
void forget_total(const std::string &job_name);

// `arguments` are those of the stock program, its name first. Waits for its end; its exit status, 128 and the
// signal's number when one ended it. Figures that cannot be written do not stop the transfer.
int run_with_figures(const StockProgram &rsync, const std::string &job_name,
                     std::vector<std::string> arguments);
