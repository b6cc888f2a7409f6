#pragma once

// How a signal ends a run in order: during a run, SIGHUP, SIGINT and SIGTERM are only noted, and every wait
// then throws. Signals that were ignored at the start stay ignored.
//
// No wait misses a signal: from the first signal on, an alarm goes off every second. It ends each wait that
// began after the note was checked.

#include <exception>

namespace bakjob
{

class Interrupted : public std::exception
{
public:
    [[nodiscard]] const char *what() const noexcept override { return "interrupted by a signal"; }
};

// While this lives, the signals are noted. At its end the earlier handlers are back and get the signal that
// was noted: by default, that ends the process. One at a time.
class CatchInterrupts
{
public:
    CatchInterrupts();
    CatchInterrupts(const CatchInterrupts &) = delete;
    CatchInterrupts &operator=(const CatchInterrupts &) = delete;
    ~CatchInterrupts();
};

bool interrupts_are_caught();

// The signal that was noted; 0 for none.
int noted_interrupt();

// Throws Interrupted when a signal was noted. To be called when a wait was broken off (EINTR).
void throw_if_interrupted();

// For the end of a run, which has to wait, too: signals no longer throw, but after so many seconds every wait
// does.
void limit_waits(int seconds);

} // namespace bakjob
