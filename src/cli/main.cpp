#include "cli/options.h"

#include <csignal>
#include <cstdio>
#include <exception>
#include <fcntl.h>
#include <new>
#include <unistd.h>

namespace
{

constexpr int FAILED = 255;

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
    std::signal(SIGXFSZ, SIG_IGN); // a file that may not grow is a failed write
    try {
        return bakjob::rsync_command_line(argc, argv);
    } catch (const std::bad_alloc &) {
        std::fputs("bakjob: out of memory\n", stderr);
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "bakjob: %s\n", failure.what());
    }
    return FAILED;
}
