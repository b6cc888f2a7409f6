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

// Who holds a flock on the open file: a process that has it by one of its handles, one of this user's if
// there is; else the one that the kernel's list of locks names, which may have handed its handle on and
// ended. None when nobody does, or when that list has no such file, as with some kinds of file systems.
std::optional<LockHolder> flock_holder(int file);

} // namespace bakjob
