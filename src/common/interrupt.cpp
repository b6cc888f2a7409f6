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

extern "C" void note(int number)
{
    if (number != SIGALRM && noted == 0) noted = number;
    alarm(1);
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
    struct sigaction action = {};
    action.sa_handler = note; // without SA_RESTART: waits are to be broken off
    sigfillset(&action.sa_mask);
    sigaction(SIGALRM, &action, &alarm_before);
    sigset_t unblocked;
    sigemptyset(&unblocked);
    sigaddset(&unblocked, SIGALRM);
    sigprocmask(SIG_UNBLOCK, &unblocked, &mask_before);
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
    alarm(0);
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
    alarm(1);
}

} // namespace bakjob
