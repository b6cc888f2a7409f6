#include "config/config_lock.h"

#include "common/interrupt.h"
#include "common/private_file.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

namespace bakjob
{

namespace
{

UniqueFd open_regular(const char *path)
{
    UniqueFd file(open(path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    struct stat status = {};
    if (file && (fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode))) file.reset();
    return file;
}

// The lock file lies where others may write. A link or a pipe of that name is nobody's lock: it is replaced.
UniqueFd open_lock_file(const char *path)
{
    UniqueFd file = open_regular(path);
    if (file) return file;
    struct stat status = {};
    if (lstat(path, &status) == 0 && !S_ISREG(status.st_mode)) unlink(path);
    file = create_file(path, 0644);
    return file ? std::move(file) : open_regular(path);
}

bool is_still_at(const char *path, int file)
{
    struct stat there = {};
    struct stat here = {};
    return lstat(path, &there) == 0 && fstat(file, &here) == 0 && there.st_ino == here.st_ino &&
           there.st_dev == here.st_dev;
}

} // namespace

UniqueFd rsync_lock_config(const char *path)
{
    for (;;) {
        UniqueFd file = open_lock_file(path);
        if (!file) return file;
        while (flock(file.get(), LOCK_EX) != 0) {
            if (errno != EINTR) return UniqueFd();
            throw_if_interrupted();
        }
        // Somebody may have replaced the file while we waited: then the lock is on the new one.
        if (is_still_at(path, file.get())) return file;
    }
}

} // namespace bakjob
