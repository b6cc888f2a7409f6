#include "cli/options.h"

#include <csignal>
#include <fcntl.h>
#include <unistd.h>

namespace
{

// A scheduler may start us with closed standard handles. The next file opened, perhaps the configuration,
// must not become one of them.
void open_standard_handles()
{
    int handle = open("/dev/null", O_RDWR);
    while (handle >= 0 && handle <= STDERR_FILENO) {
        handle = open("/dev/null", O_RDWR);
    }
    if (handle >= 0) close(handle);
}

} // namespace

int main(int argc, char **argv)
{
    open_standard_handles();
    std::signal(SIGCHLD, SIG_DFL); // the exit codes of commands are ours to collect
    std::signal(SIGPIPE, SIG_IGN); // nobody reading the trace is no reason to stop a backup
    return bakjob::rsync_command_line(argc, argv);
}
