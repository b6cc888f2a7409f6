#include "common/shell.h"

#include "common/debug_log.h"
#include "common/interrupt.h"
#include "common/text.h"

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>

namespace bakjob
{

namespace
{

constexpr std::size_t REPLY_LENGTH = 1023;

// While a command runs, what the terminal sends is for the command alone; but an interrupt ends a run.
class IgnoreTerminal
{
public:
    IgnoreTerminal()
    {
        struct sigaction ignore = {};
        ignore.sa_handler = SIG_IGN;
        sigaction(SIGINT, interrupts_are_caught() ? nullptr : &ignore, &interrupt_);
        sigaction(SIGQUIT, &ignore, &quit_);
    }
    IgnoreTerminal(const IgnoreTerminal &) = delete;
    IgnoreTerminal &operator=(const IgnoreTerminal &) = delete;
    ~IgnoreTerminal()
    {
        sigaction(SIGINT, &interrupt_, nullptr);
        sigaction(SIGQUIT, &quit_, nullptr);
    }

    // What the command is not to inherit from us.
    [[nodiscard]] sigset_t not_ignored_before() const
    {
        sigset_t signals = {};
        if (interrupt_.sa_handler != SIG_IGN) sigaddset(&signals, SIGINT);
        if (quit_.sa_handler != SIG_IGN) sigaddset(&signals, SIGQUIT);
        return signals;
    }

private:
    struct sigaction interrupt_ = {};
    struct sigaction quit_ = {};
};

// The shell's process, -1 when it cannot be started. `output` below 0 keeps the program's own standard
// output; `signals` get their default action. Unlike fork, posix_spawn copies nothing of this process.
pid_t start_shell(const std::string &command, int output, sigset_t signals)
{
    const char *const arguments[] = {"sh", "-f", "-c", command.c_str(), nullptr};
    const std::string mark = run_mark(getpid());
    const char *const environment[] = {"PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin",
                                       "LC_ALL=C", mark.c_str(), nullptr};
    posix_spawn_file_actions_t handles;
    posix_spawn_file_actions_init(&handles);
    const UniqueFd nothing(open("/dev/null", O_RDONLY | O_CLOEXEC));
    if (nothing) posix_spawn_file_actions_adddup2(&handles, nothing.get(), STDIN_FILENO);
    if (output >= 0) posix_spawn_file_actions_adddup2(&handles, output, STDOUT_FILENO);

    posix_spawnattr_t attributes;
    posix_spawnattr_init(&attributes);
    posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGDEF);
    sigaddset(&signals, SIGPIPE);
    sigaddset(&signals, SIGXFSZ);
    posix_spawnattr_setsigdefault(&attributes, &signals);

    pid_t child = -1;
    const int failure =
        posix_spawn(&child, "/bin/sh", &handles, &attributes, const_cast<char *const *>(arguments),
                    const_cast<char *const *>(environment));
    posix_spawnattr_destroy(&attributes);
    posix_spawn_file_actions_destroy(&handles);
    errno = failure;
    return failure == 0 ? child : -1;
}

int wait_for(pid_t child)
{
    int status = 0;
    while (waitpid(child, &status, 0) < 0) {
        if (errno != EINTR) return -1;
        throw_if_interrupted();
    }
    throw_if_interrupted(); // what the command was ended by may have been meant for the run as well
    return status;
}

} // namespace

std::string run_mark(pid_t run)
{
    return format_text("%s=%d", RUN_MARK, run);
}

int exit_code(int status)
{
    if (status == -1) return -1;
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

int run_shell(const std::string &command)
{
    throw_if_interrupted();
    std::fflush(stdout);
    const IgnoreTerminal ignore;
    const pid_t child = start_shell(command, -1, ignore.not_ignored_before());
    if (child >= 0) return wait_for(child);
    DebugLog("ERROR: the shell could not be started: %s\n", std::strerror(errno));
    return -1;
}

ShellReader::ShellReader(const std::string &command)
{
    throw_if_interrupted();
    std::fflush(stdout);
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0) return;
    UniqueFd reading(ends[0]);
    const UniqueFd writing(ends[1]);
    child_ = start_shell(command, writing.get(), {});
    if (child_ < 0) return;
    output_.reset(fdopen(reading.get(), "r"));
    if (output_) reading.release();
}

ShellReader::~ShellReader()
{
    // A command that was not waited for, in a run, is ended with the run.
    if (child_ > 0 && !interrupts_are_caught()) close();
}

bool ShellReader::read_line(std::string &line)
{
    const bool read = output_ && bakjob::read_line(output_.get(), line);
    throw_if_interrupted(); // a signal can look like the end of the output
    return read;
}

int ShellReader::close()
{
    output_.reset();
    const pid_t child = std::exchange(child_, -1);
    return child > 0 ? wait_for(child) : -1;
}

std::optional<std::string> first_line(const std::string &command)
{
    ShellReader reply(command);
    if (!reply.started()) return std::nullopt;
    std::string first;
    reply.read_line(first);
    std::string rest;
    while (reply.read_line(rest)) {
    }
    reply.close();
    trim_right(first);
    return first;
}

std::optional<std::string> first_reply_line(const std::string &command)
{
    auto line = first_line(command);
    if (line && line->size() > REPLY_LENGTH) {
        line->resize(REPLY_LENGTH);
        trim_right(*line);
    }
    return line;
}

} // namespace bakjob
