#pragma once

namespace bakjob::ctl
{

// While this lives, a signal that ends the program runs the action first, which must be safe in a signal
// handler. One at a time.
class OnSignal
{
public:
    explicit OnSignal(void (*action)());
    OnSignal(const OnSignal &) = delete;
    OnSignal &operator=(const OnSignal &) = delete;
    ~OnSignal();
};

} // namespace bakjob::ctl
