#pragma once

// Which process holds a lock, for whoever has to wait for it.

#include <optional>
#include <string>
#include <sys/types.h>

namespace bakjob
{

struct LockHolder {
    pid_t process;
    std::string program; // printable; empty when the process is gone
    bool neighbour;      // whether another user's processes alone hold it
};

// Who holds a flock on the open file: a process with a locked handle of it, one of this user's if there is
// one; else the process that the kernel's list of locks names, which may have passed its handle on and ended.
// Nullopt when the file is not locked, or not in that list, as on some file systems.
std::optional<LockHolder> flock_holder(int file);

} // namespace bakjob
