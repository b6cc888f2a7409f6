#include "cli/run_processes.h"

#include "common/debug_log.h"
#include "common/shell.h"

#include <algorithm>
#include <chrono>
#include <csignal>
#include <thread>
#include <unistd.h>

namespace bakjob
{

namespace
{

constexpr int KILL_SECONDS = 5;

bool holds(const std::vector<Process> &processes, const Process &process)
{
    return std::find(processes.begin(), processes.end(), process) != processes.end();
}

} // namespace

RunProcesses::RunProcesses(pid_t run, bool is_the_run) : mark_(run_mark(run))
{
    for (const Process &process : running_processes()) {
        if (process.id == run && run != getpid()) (is_the_run ? found_ : spared_).push_back(process);
    }
    look_again();
}

void RunProcesses::look_again()
{
    const std::vector<Process> all = running_processes();
    const auto has_ended = [&](const Process &process) { return !holds(all, process); };
    std::erase_if(found_, has_ended);
    std::erase_if(spared_, has_ended);
    add_descendants(spared_, all);
    for (const Process &process : all) {
        if (!holds(found_, process) && is_roots_with_entry(process.id, mark_)) found_.push_back(process);
    }
    add_descendants(found_, all);
    std::erase_if(found_,
                  [&](const Process &process) { return process.id == getpid() || holds(spared_, process); });
}

bool RunProcesses::end_within(int seconds, int number)
{
    using Clock = std::chrono::steady_clock;
    const auto end = Clock::now() + std::chrono::seconds(seconds);
    for (std::vector<Process> told; !found_.empty(); look_again()) {
        for (const Process &process : found_) {
            if (holds(told, process)) continue;
            kill(process.id, number);
            told.push_back(process);
        }
        if (Clock::now() >= end) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    return true;
}

void RunProcesses::end(int grace)
{
    look_again();
    if (grace > 0 && end_within(grace, SIGTERM)) return;
    if (end_within(KILL_SECONDS, SIGKILL)) return;
    for (const Process &process : found_) {
        DebugLog("ERROR: process %d of the run cannot be ended\n", process.id);
    }
}

} // namespace bakjob
