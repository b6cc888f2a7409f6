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
#include <utility>

namespace bakjob
{

namespace
{

using std::chrono::milliseconds;

constexpr mode_t LOCK_MODE = 0600;
constexpr int MAX_TRIES = 1000; // while somebody keeps putting something there
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

enum class Wait { TAKEN, NEIGHBOUR, FAILED };

// Waits until the lock is taken, or turns out to be held by another user, who opened the file before it got
// its mode. That user may hold it for ever.
Wait wait_for_flock(const char *path, int file)
{
    bool told = false;
    for (milliseconds waited(0); flock(file, LOCK_EX | LOCK_NB) != 0; waited += BETWEEN_LOOKS) {
        if (errno != EWOULDBLOCK && errno != EINTR) return Wait::FAILED;
        throw_if_interrupted();
        if (waited > milliseconds(0) && waited % UNTOLD_WAIT == milliseconds(0)) {
            const auto holder = flock_holder(file);
            if (holder && holder->neighbour) return Wait::NEIGHBOUR;
            if (!told && tell_of_wait != nullptr) tell_of_wait(path, holder);
            told = true;
        }
        std::this_thread::sleep_for(BETWEEN_LOOKS);
    }
    return Wait::TAKEN;
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

// Held while something is moved aside: two processes that do that at once would move each other's new lock
// away. It lies where no other user can write, and stays there from the first time on.
UniqueFd take_guard(bool make)
{
    UniqueFd guard = make ? create_file(LOCK_GUARD_FILE, LOCK_MODE) : UniqueFd();
    if (!guard && (!make || errno == EEXIST)) guard = open_own_file(LOCK_GUARD_FILE, O_RDONLY);
    if (guard && wait_for_flock(LOCK_GUARD_FILE, guard.get()) != Wait::TAKEN) guard.reset();
    return guard;
}

// A file of this user's with several names is the lock, with a second name that somebody gave it, or another
// file that somebody linked here. An honest holder is waited for, but not for long: a neighbour or a daemon
// may hold it for ever. Its mode stays, as it may be /etc/passwd.
UniqueFd wait_for_linked(const char *path, milliseconds &patience)
{
    UniqueFd file(open(path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    if (file) flock_within(patience, file.get());
    return file;
}

// What others put there is kept, under a name that they cannot guess.
bool move_aside(const char *path)
{
    const auto now = std::chrono::steady_clock::now().time_since_epoch().count();
    const std::string aside =
        std::string(path) + ".aside." + std::to_string(getpid()) + '.' + std::to_string(now);
    return renameat2(AT_FDCWD, path, AT_FDCWD, aside.c_str(), RENAME_NOREPLACE) == 0;
}

// A new file is a lock for its creator even when somebody gives it another name at once: whoever moves it
// aside waits for the lock first. A lock that a neighbour holds, if given, is in the way, too.
UniqueFd make_lock(const char *path, milliseconds &patience, const UniqueFd &held_by_neighbour)
{
    struct stat there = {};
    const auto is_fine = [&] {
        return is_lock(there) && !(held_by_neighbour && is_at(path, held_by_neighbour.get()));
    };
    const bool in_the_way = lstat(path, &there) == 0 && !is_fine();
    const UniqueFd guard = take_guard(in_the_way);
    UniqueFd linked;
    if (lstat(path, &there) == 0) {
        if (is_fine()) return open_lock(path); // made by another meanwhile
        if (!guard) return UniqueFd();
        if (is_own_file(there) && !is_lock(there)) linked = wait_for_linked(path, patience);
        if (!move_aside(path)) return UniqueFd();
    }
    return create_file(path, LOCK_MODE);
}

UniqueFd take_lock(const char *path)
{
    milliseconds patience = LINKED_WAIT;
    UniqueFd held_by_neighbour;
    for (int tries = 0; tries < MAX_TRIES; ++tries) {
        UniqueFd lock = held_by_neighbour ? UniqueFd() : open_lock(path);
        if (!lock) lock = make_lock(path, patience, held_by_neighbour);
        held_by_neighbour.reset();
        if (!lock) continue;
        const Wait wait = wait_for_flock(path, lock.get());
        if (wait == Wait::FAILED) return UniqueFd();
        if (wait == Wait::NEIGHBOUR) {
            held_by_neighbour = std::move(lock);
            continue;
        }
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
