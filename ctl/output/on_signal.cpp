#include "output/on_signal.h"

#include <csignal>

namespace bakjob::ctl
{

namespace
{

constexpr int SIGNALS[] = {SIGINT, SIGTERM, SIGHUP, SIGQUIT};

void (*the_action)() = nullptr;

void handle(int number)
{
    the_action();
    std::signal(number, SIG_DFL);
    std::raise(number);
}

void set_all(void (*handler)(int))
{
    for (const int number : SIGNALS) {
        std::signal(number, handler);
    }
}

} // namespace

OnSignal::OnSignal(void (*action)())
{
    the_action = action;
    set_all(handle);
}

OnSignal::~OnSignal()
{
    set_all(SIG_DFL);
}

} // namespace bakjob::ctl
