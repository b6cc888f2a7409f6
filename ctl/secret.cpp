#include "secret.h"

#include "failure.h"

#include <csignal>
#include <cstdio>
#include <iostream>
#include <termios.h>
#include <unistd.h>

namespace bakjob::ctl
{

namespace
{

void end_the_read(int /*signal*/) {}

// A terminal that shows nothing for as long as this lives. An interrupt only ends the read, so that the
// terminal is as it was when the program ends.
class SilentTerminal
{
public:
    SilentTerminal()
    {
        struct sigaction action = {};
        action.sa_handler = end_the_read;
        sigaction(SIGINT, &action, &on_interrupt_);
        tcgetattr(STDIN_FILENO, &before_);
        termios silent = before_;
        silent.c_lflag &= ~static_cast<tcflag_t>(ECHO);
        tcsetattr(STDIN_FILENO, TCSAFLUSH, &silent);
    }
    SilentTerminal(const SilentTerminal &) = delete;
    SilentTerminal &operator=(const SilentTerminal &) = delete;
    ~SilentTerminal()
    {
        tcsetattr(STDIN_FILENO, TCSAFLUSH, &before_);
        sigaction(SIGINT, &on_interrupt_, nullptr);
    }

private:
    termios before_{};
    struct sigaction on_interrupt_ = {};
};

} // namespace

std::string read_secret(const std::string &what)
{
    std::string secret;
    bool read = false;
    if (isatty(STDIN_FILENO) == 1) {
        std::fprintf(stderr, "%s: ", what.c_str());
        const SilentTerminal silent;
        read = static_cast<bool>(std::getline(std::cin, secret));
        std::fputc('\n', stderr);
    } else {
        read = static_cast<bool>(std::getline(std::cin, secret));
    }
    if (!read) throw Failure(what + ": no password was given");
    return secret;
}

} // namespace bakjob::ctl
