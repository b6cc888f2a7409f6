#include "common/debug_log.h"

#include "common/job_files.h"
#include "common/private_file.h"
#include "common/run_options.h"

#include <cstdarg>
#include <cstdio>
#include <fcntl.h>
#include <unistd.h>

namespace bakjob
{

namespace
{

char last_message[1024]; // empty: nothing was written to the file yet

void append_to_file(const char *format, va_list arguments)
{
    if (last_message[0] == '\0') unlink(TRACE_FILE);
    std::vsnprintf(last_message, sizeof last_message, format, arguments);
    // Commands are traced with their passwords, so nobody else may read the file.
    UniqueFd file = create_file(TRACE_FILE, 0600);
    if (!file) file = open_own_file(TRACE_FILE, O_WRONLY | O_APPEND);
    if (file) write_all(file.get(), last_message);
}

} // namespace

void DebugLog(const char *format, ...)
{
    if (run_options.debug_mode == 0) return;
    va_list arguments;
    va_start(arguments, format);
    if (run_options.debug_mode == 1) {
        std::vprintf(format, arguments);
        std::fflush(stdout);
    } else {
        append_to_file(format, arguments);
    }
    va_end(arguments);
}

} // namespace bakjob
