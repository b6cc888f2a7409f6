#include "common/process_start.h"

#include <csignal>
#include <fcntl.h>
#include <unistd.h>

namespace bakjob
{

void rsync_prepare_process()
{
    int handle = open("/dev/null", O_RDWR);
    while (handle >= 0 && handle <= STDERR_FILENO) {
        handle = open("/dev/null", O_RDWR);
    }
    if (handle >= 0) close(handle);
    std::signal(SIGCHLD, SIG_DFL);
}

} // namespace bakjob
