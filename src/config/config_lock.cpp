#include "config/config_lock.h"

#include "common/debug_log.h"
#include "common/interrupt.h"
#include "common/job_files.h"
#include "common/private_file.h"

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace bakjob
{

namespace
{

using std::chrono::milliseconds;

constexpr mode_t LOCK_MODE = 0600;
constexpr int MOST_TRIES = 1000; // against somebody who puts something there again and again
constexpr milliseconds BETWEEN_LOOKS(5);
constexpr milliseconds UNTOLD_WAIT(1000);
constexpr milliseconds LINKED_WAIT(5000); // longer than a save and its way to flash

LockWait tell_of_wait = nullptr;

bool is_own_file(const struct stat &status)
{
    return S_ISREG(status.st_mode) && status.st_uid == geteuid();
}

bool is_lock(const struct stat &status)
{
    return is_own_file(status) && status.st_nlink == 1;
}

// What is waited is taken from `patience`; false when that is used up.
bool flock_within(milliseconds &patience, int file)
{
    while (flock(file, LOCK_EX | LOCK_NB) != 0) {
        if (patience <= milliseconds(0)) return false;
        std::this_thread::sleep_for(BETWEEN_LOOKS);
        patience -= BETWEEN_LOOKS;
    }
    return true;
}

bool wait_for_flock(const char *path, int file)
{
    if (tell_of_wait != nullptr) {
        milliseconds untold = UNTOLD_WAIT;
        if (flock_within(untold, file)) return true;
        tell_of_wait(path, flock_holder(file));
    }
    while (flock(file, LOCK_EX) != 0) {
        if (errno != EINTR) return false;
        throw_if_interrupted();
    }
    return true;
}

UniqueFd open_lock(const char *path)
{
    UniqueFd file = open_own_file(path, O_RDONLY);
    struct stat status = {};
    if (file && fstat(file.get(), &status) == 0 && (status.st_mode & 07777U) != LOCK_MODE) {
        fchmod(file.get(), LOCK_MODE); // nobody else opens it from now on
    }
    return file;
}

// Held while something is moved aside: two who do that at once would move away each other's new lock. It
// lies where nobody else can write, and from the first time on it is there.
UniqueFd take_guard(bool make)
{
    UniqueFd guard = make ? create_file(LOCK_GUARD_FILE, LOCK_MODE) : UniqueFd();
    if (!guard && (!make || errno == EEXIST)) guard = open_own_file(LOCK_GUARD_FILE, O_RDONLY);
    if (guard && !wait_for_flock(LOCK_GUARD_FILE, guard.get())) guard.reset();
    return guard;
}

// A file of this user's with more names than one is either the lock, to which somebody gave another name, or
// another file that he linked here. An honest holder is waited for, but a neighbour or a daemon may hold it
// for ever. Its mode stays: it may be that of /etc/passwd.
UniqueFd wait_for_linked(const char *path, milliseconds &patience)
{
    UniqueFd file(open(path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    if (file) flock_within(patience, file.get());
    return file;
}

// What others put there stays theirs, at a name that they cannot have taken beforehand.
bool move_aside(const char *path)
{
    const auto now = std::chrono::steady_clock::now().time_since_epoch().count();
    const std::string aside =
        std::string(path) + ".aside." + std::to_string(getpid()) + '.' + std::to_string(now);
    return renameat2(AT_FDCWD, path, AT_FDCWD, aside.c_str(), RENAME_NOREPLACE) == 0;
}

// The file that is made is a lock for the one who made it, even if somebody gives it another name at once:
// whoever moves it aside for that waits for the lock first.
UniqueFd make_lock(const char *path, milliseconds &patience)
{
    struct stat there = {};
    const bool in_the_way = lstat(path, &there) == 0 && !is_lock(there);
    const UniqueFd guard = take_guard(in_the_way);
    UniqueFd linked;
    if (lstat(path, &there) == 0) {
        if (is_lock(there)) return open_lock(path); // made by another meanwhile
        if (!guard) return UniqueFd();
        if (is_own_file(there)) linked = wait_for_linked(path, patience);
        if (!move_aside(path)) return UniqueFd();
    }
    return create_file(path, LOCK_MODE);
}

UniqueFd take_lock(const char *path)
{
    milliseconds patience = LINKED_WAIT;
    for (int tries = 0; tries < MOST_TRIES; ++tries) {
        UniqueFd lock = open_lock(path);
        if (!lock) lock = make_lock(path, patience);
        if (!lock) continue;
        if (!wait_for_flock(path, lock.get())) return UniqueFd();
        // Somebody may have replaced the file while we waited: then the lock is on the new one.
        if (is_at(path, lock.get())) return lock;
        errno = EBUSY;
    }
    return UniqueFd();
}

} // namespace

UniqueFd rsync_lock_config(const char *path)
{
    UniqueFd lock = take_lock(path);
    if (!lock) {
        const int why = errno;
        DebugLog("ERROR: [%s] cannot be locked: %s\n", path, std::strerror(why));
        errno = why;
    }
    return lock;
}

void rsync_tell_lock_waits(LockWait tell)
{
    tell_of_wait = tell;
}

} // namespace bakjob
