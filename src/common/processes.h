#pragma once

// What /proc tells about the processes of this machine.

#include <string_view>
#include <sys/types.h>
#include <vector>

namespace bakjob
{

struct Process {
    pid_t id;
    pid_t parent;
    unsigned long long started; // with the id, tells it from a later process that got the same id

    bool operator==(const Process &other) const { return id == other.id && started == other.started; }
};

// Every process that has not ended; a zombie has. Throws std::system_error when /proc cannot be read.
std::vector<Process> running_processes();

bool is_running(pid_t process);

// Adds to `family` those of `all` whose parent is in it, and theirs.
void add_descendants(std::vector<Process> &family, const std::vector<Process> &all);

// Whether a process is root's in every respect, sees the same process ids as this one, and was started with
// this entry ("NAME=VALUE") in its environment. What somebody else's process carries proves nothing.
bool is_roots_with_entry(pid_t process, std::string_view entry);

} // namespace bakjob
