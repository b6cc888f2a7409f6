#include "cli/options.h"
#include "common/process_start.h"

#include <csignal>
#include <cstdio>
#include <exception>
#include <new>

namespace
{

constexpr int FAILED = 255;

} // namespace

int main(int argc, char **argv)
{
    bakjob::rsync_prepare_process();
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
