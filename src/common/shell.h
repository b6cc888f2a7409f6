#pragma once

// The one module that runs commands: through the system shell, one at a time, waited for. Commands see a
// fixed environment (the standard folders for programs, messages in English, the mark of this process),
// nothing on their standard input, and no file-name patterns: an IPv6 host in brackets is not one.
//
// During a run (interrupt.h) a signal that ends it ends the waits, too: these functions throw Interrupted,
// and the command is left to whoever ends the run.

#include "common/handles.h"

#include <cstddef>
#include <optional>
#include <string>
#include <sys/types.h>

namespace bakjob
{

inline constexpr std::size_t COMMAND_SIZE = 2048; // bytes of a command, terminator included

// In the environment of every command, with the id of this process: what a run has started is known by it.
inline constexpr const char *RUN_MARK = "BAKJOB_RUN";
std::string run_mark(pid_t run); // the whole entry

// Whether a composed command fits its buffer. One that does not is refused, never cut.
inline bool fits_command(const std::string &command)
{
    return command.size() < COMMAND_SIZE;
}

// What is seen of a command that could not be started.
inline constexpr const char *NOT_STARTED = "the command could not be started";

// Runs the command and waits. Its wait status, 0 for success; -1 when it could not be started.
int run_shell(const std::string &command);

// The exit code in a wait status; 128 and the signal's number when a signal ended the command; -1 of -1.
int exit_code(int status);

// A command whose output is read line by line.
class ShellReader
{
public:
    explicit ShellReader(const std::string &command);
    ShellReader(const ShellReader &) = delete;
    ShellReader &operator=(const ShellReader &) = delete;
    ~ShellReader();

    // Whether the command could be started.
    [[nodiscard]] bool started() const { return output_ != nullptr; }

    // The next line (read_line of text.h); false at the end.
    bool read_line(std::string &line);

    // Stops reading and waits. The command's wait status, -1 when it could not be started.
    int close();

private:
    UniqueFile output_;
    pid_t child_ = -1;
};

// The first line of the command's output without trailing white space; the rest is read and thrown away, so
// the command always runs to its end. Nullopt when it could not be started.
std::optional<std::string> first_line(const std::string &command);

// The same, of a long line only the first 1023 bytes: what probes are judged by.
std::optional<std::string> first_reply_line(const std::string &command);

} // namespace bakjob
