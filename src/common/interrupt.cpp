#include "common/interrupt.h"

#include <array>
#include <csignal>
#include <cstdio>
#include <ctime>
#include <unistd.h>

namespace bakjob
{

namespace
{

constexpr std::array SIGNALS = {SIGHUP, SIGINT, SIGTERM};

volatile std::sig_atomic_t noted = 0;
bool caught = false;
std::time_t waits_end = 0; // on the monotonic clock; 0: waits are not limited

struct sigaction before[SIGNALS.size()];
struct sigaction alarm_before;
sigset_t mask_before;

extern "C" void note(int number);

// Waits are to be broken off, so without SA_RESTART.
struct sigaction noting()
{
    struct sigaction action = {};
    action.sa_handler = note;
    sigfillset(&action.sa_mask);
    return action;
}

// Not before it is needed: an alarm that our caller has set is not ours.
void start_alarm()
{
    const struct sigaction action = noting();
    sigaction(SIGALRM, &action, nullptr);
    alarm(1);
}

extern "C" void note(int number)
{
    if (number != SIGALRM && noted == 0) noted = number;
    if (noted != 0 || waits_end != 0) start_alarm();
}

std::time_t monotonic_seconds()
{
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return now.tv_sec;
}

} // namespace

CatchInterrupts::CatchInterrupts()
{
    noted = 0;
    waits_end = 0;
    const struct sigaction action = noting();
    sigaction(SIGALRM, nullptr, &alarm_before);
    sigprocmask(SIG_SETMASK, nullptr, &mask_before);
    if (sigismember(&mask_before, SIGALRM) == 1) {
        sigaction(SIGALRM, &action, nullptr);
        sigset_t unblocked;
        sigemptyset(&unblocked);
        sigaddset(&unblocked, SIGALRM);
        sigprocmask(SIG_UNBLOCK, &unblocked, nullptr);
    }
    for (std::size_t i = 0; i < SIGNALS.size(); ++i) {
        sigaction(SIGNALS[i], nullptr, &before[i]);
        if (before[i].sa_handler != SIG_IGN) sigaction(SIGNALS[i], &action, nullptr);
    }
    caught = true;
}

CatchInterrupts::~CatchInterrupts()
{
    caught = false;
    for (std::size_t i = 0; i < SIGNALS.size(); ++i) {
        sigaction(SIGNALS[i], &before[i], nullptr);
    }
    if (noted != 0 || waits_end != 0) alarm(0);
    sigaction(SIGALRM, &alarm_before, nullptr);
    sigprocmask(SIG_SETMASK, &mask_before, nullptr);
    if (noted == 0) return;
    std::fflush(stdout);
    std::raise(noted);
}

bool interrupts_are_caught()
{
    return caught;
}

int noted_interrupt()
{
    return noted;
}

void throw_if_interrupted()
{
    if (!caught) return;
    if (waits_end == 0 ? noted != 0 : monotonic_seconds() >= waits_end) throw Interrupted();
}

void limit_waits(int seconds)
{
    waits_end = monotonic_seconds() + seconds;
    start_alarm();
}

} // namespace bakjob
