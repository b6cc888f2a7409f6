// bench_peak_memory CMD...: runs a command and prints the most memory, in kB, that its process held; what the
// processes hold that it starts does not count. The kernel tells that only of a process that is still there,
// so this one is stopped at its exit.

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

constexpr int AT_EXIT = SIGTRAP | PTRACE_EVENT_EXIT << 8;

long peak_of(pid_t process)
{
    std::ifstream status("/proc/" + std::to_string(process) + "/status");
    for (std::string line; std::getline(status, line);) {
        if (line.starts_with("VmHWM:")) return std::strtol(line.c_str() + 6, nullptr, 10);
    }
    return -1;
}

} // namespace

int main(int argc, char **argv)
{
    if (argc < 2) return 2;
    const pid_t child = fork();
    if (child == 0) {
        ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
        execvp(argv[1], argv + 1);
        _exit(127);
    }
    int status = 0;
    if (child < 0 || waitpid(child, &status, 0) < 0 || !WIFSTOPPED(status)) return 1;
    ptrace(PTRACE_SETOPTIONS, child, nullptr, PTRACE_O_TRACEEXIT);
    long peak = -1;
    long signal = 0;
    while (ptrace(PTRACE_CONT, child, nullptr, signal) == 0 && waitpid(child, &status, 0) == child) {
        if (!WIFSTOPPED(status)) break;
        const bool leaves = status >> 8 == AT_EXIT;
        if (leaves) peak = peak_of(child);
        signal = leaves ? 0 : WSTOPSIG(status);
    }
    std::printf("%ld\n", peak);
    return peak > 0 && WIFEXITED(status) ? WEXITSTATUS(status) : 1;
}
