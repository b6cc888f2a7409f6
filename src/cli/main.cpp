#include "cli/options.h"
#include "common/process_start.h"

#include <csignal>

int main(int argc, char **argv)
{
    bakjob::rsync_prepare_process();
    std::signal(SIGPIPE, SIG_IGN); // nobody reading the trace is no reason to stop a backup
    return bakjob::rsync_command_line(argc, argv);
}
