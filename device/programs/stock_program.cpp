#include "stock_program.h"

#include "common/processes.h"
#include "common/shell.h"

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

using Clock = std::chrono::steady_clock;

constexpr const char *TRANSFER_MARK = "DEVICE_TRANSFER";
constexpr int PROBE_SECONDS = 120;
constexpr int KILL_SECONDS = 5;

std::chrono::seconds probe_bound()
{
    const char *const text = std::getenv("DEVICE_PROBE_SECONDS");
    const long seconds = text == nullptr ? 0 : std::strtol(text, nullptr, 10);
    return std::chrono::seconds(seconds > 0 ? seconds : PROBE_SECONDS);
}

// The end of a child, and whatever would end this process, which is passed on to the child.
sigset_t awaited_signals()
{
    sigset_t signals;
    sigemptyset(&signals);
    for (const int number : {SIGCHLD, SIGHUP, SIGINT, SIGQUIT, SIGTERM, SIGUSR1, SIGUSR2}) {
        sigaddset(&signals, number);
    }
    return signals;
}

// Nullopt while it runs. What it left behind is this process's child as well.
std::optional<int> status_of(pid_t child)
{
    std::optional<int> status;
    int ended = 0;
    for (pid_t one = 0; (one = waitpid(-1, &ended, WNOHANG)) > 0;) {
        if (one == child) status = ended;
    }
    return status;
}

// Its wait status; nullopt when it has run too long.
std::optional<int> wait_for(pid_t child, const sigset_t &awaited)
{
    const auto end = Clock::now() + probe_bound();
    for (;;) {
        if (const auto status = status_of(child)) return status;
        const auto left = std::chrono::duration_cast<std::chrono::nanoseconds>(end - Clock::now()).count();
        if (left <= 0) return std::nullopt;
        constexpr long NANOSECONDS = 1'000'000'000;
        const timespec time{.tv_sec = static_cast<time_t>(left / NANOSECONDS),
                            .tv_nsec = static_cast<long>(left % NANOSECONDS)};
        siginfo_t told{};
        const int number = sigtimedwait(&awaited, &told, &time);
        // What the terminal sends has come to the child as well.
        if (number > 0 && number != SIGCHLD && told.si_code != SI_KERNEL) kill(child, number);
    }
}

// Whatever a killed process leaves behind becomes this one's child.
void kill_descendants()
{
    const auto end = Clock::now() + std::chrono::seconds(KILL_SECONDS);
    do {
        std::vector<bakjob::Process> family{{.id = getpid(), .parent = 0, .started = 0}};
        bakjob::add_descendants(family, bakjob::running_processes());
        for (std::size_t i = 1; i < family.size(); ++i) {
            kill(family[i].id, SIGKILL);
        }
        while (waitpid(-1, nullptr, WNOHANG) > 0) {
        }
        if (waitpid(-1, nullptr, WNOHANG) < 0) return; // there is none
        usleep(10'000);
    } while (Clock::now() < end);
}

int end_like(int status)
{
    if (WIFEXITED(status)) return WEXITSTATUS(status);
    const int number = WTERMSIG(status);
    prctl(PR_SET_DUMPABLE, 0); // the program itself has dumped its core
    std::signal(number, SIG_DFL);
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, number);
    std::raise(number);
    sigprocmask(SIG_UNBLOCK, &signals, nullptr);
    return 128 + number;
}

} // namespace

int become_stock(const StockProgram &program, const std::vector<std::string> &arguments)
{
    std::vector<char *> pointers;
    pointers.reserve(arguments.size() + 1);
    for (const std::string &argument : arguments) {
        pointers.push_back(const_cast<char *>(argument.c_str()));
    }
    pointers.push_back(nullptr);
    execv(program.path, pointers.data());
    std::fprintf(stderr, "%s: cannot run %s: %s\n", program.name, program.path, std::strerror(errno));
    return program.failed;
}

bool is_probe()
{
    return std::getenv(bakjob::RUN_MARK) != nullptr && std::getenv(TRANSFER_MARK) == nullptr;
}

int run_stock(const StockProgram &program, const std::vector<std::string> &arguments)
{
    if (!is_probe()) return become_stock(program, arguments);
    std::signal(SIGCHLD, SIG_DFL);
    prctl(PR_SET_CHILD_SUBREAPER, 1);
    const sigset_t awaited = awaited_signals();
    sigset_t mask;
    sigprocmask(SIG_BLOCK, &awaited, &mask);
    const pid_t own = getpid();
    const pid_t child = fork();
    if (child < 0) {
        std::fprintf(stderr, "%s: cannot run %s: %s\n", program.name, program.path, std::strerror(errno));
        return program.failed;
    }
    if (child == 0) {
        sigprocmask(SIG_SETMASK, &mask, nullptr);
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        if (getppid() != own) _exit(program.failed);
        _exit(become_stock(program, arguments));
    }
    if (const auto status = wait_for(child, awaited)) return end_like(*status);
    kill_descendants();
    return program.timed_out;
}

void mark_transfer()
{
    setenv(TRANSFER_MARK, "1", 1);
}
