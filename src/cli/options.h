#pragma once

// The command line: options act one by one, in the order in which they stand.

namespace bakjob
{

// Acts on the options and returns the exit status: 255 for a refusal, else 0.
int rsync_command_line(int argc, char **argv);

void print_usage();

} // namespace bakjob
