#include "output/secret.h"

#include "output/failure.h"
#include "output/on_signal.h"

#include <cstdio>
#include <iostream>
#include <termios.h>
#include <unistd.h>

namespace bakjob::ctl
{

namespace
{

termios usual_terminal;

void restore_terminal()
{
    tcsetattr(STDIN_FILENO, TCSAFLUSH, &usual_terminal);
}

// While this lives, the terminal shows nothing that is typed, and Ctrl-Z does not stop the program.
class SilentTerminal
{
public:
    SilentTerminal()
    {
        termios silent = usual_terminal;
        silent.c_lflag &= ~static_cast<tcflag_t>(ECHO);
        silent.c_cc[VSUSP] = _POSIX_VDISABLE;
        tcsetattr(STDIN_FILENO, TCSAFLUSH, &silent);
    }
    SilentTerminal(const SilentTerminal &) = delete;
    SilentTerminal &operator=(const SilentTerminal &) = delete;
    ~SilentTerminal() { restore_terminal(); }

private:
    OnSignal on_signal_{restore_terminal};
};

} // namespace

std::string read_secret(const std::string &what)
{
    std::string secret;
    bool read = false;
    if (tcgetattr(STDIN_FILENO, &usual_terminal) == 0) {
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
