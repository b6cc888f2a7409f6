#include "common/debug_log.h"

#include "common/job_files.h"
#include "common/private_file.h"
#include "common/run_options.h"
#include "common/text.h"

#include <cstdarg>
#include <cstdio>
#include <fcntl.h>
#include <string>
#include <unistd.h>

namespace bakjob
{

namespace
{

char last_message[1024]; // empty: nothing was written to the file yet

void append_to_file(const char *format, va_list arguments)
{
    if (last_message[0] == '\0') std::remove(TRACE_FILE);
    std::vsnprintf(last_message, sizeof last_message, format, arguments);
    // Commands are traced with their passwords, so nobody else may read the file.
    UniqueFd file = create_file(TRACE_FILE, 0600);
    if (!file) file = open_own_file(TRACE_FILE, O_WRONLY | O_APPEND);
    if (file) write_all(file.get(), last_message);
}

// What a name or a remote side smuggles into a message must not act on a terminal.
void show(const char *format, va_list arguments)
{
    std::string message = format_text(format, arguments);
    const bool ends_line = message.ends_with('\n');
    if (ends_line) message.pop_back();
    std::printf("%s%s", printable(message).c_str(), ends_line ? "\n" : "");
}

} // namespace

void DebugLog(const char *format, ...)
{
    if (run_options.debug_mode == 0) return;
    va_list arguments;
    va_start(arguments, format);
    if (run_options.debug_mode == 1) {
        if (isatty(STDOUT_FILENO) == 1) {
            show(format, arguments);
        } else {
            std::vprintf(format, arguments);
        }
        std::fflush(stdout);
    } else {
        append_to_file(format, arguments);
    }
    va_end(arguments);
}

} // namespace bakjob
