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
};

// Who holds a flock on the open file, as the kernel's list of locks tells; one of them when it is shared.
// None when nobody does, or when that list has no such file, as with some kinds of file systems.
std::optional<LockHolder> flock_holder(int file);

} // namespace bakjob
