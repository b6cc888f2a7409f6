#include "common/private_file.h"

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace bakjob
{

UniqueFd create_file(const std::string &path, mode_t mode)
{
    UniqueFd file(open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, mode));
    // The umask may have taken more away than was asked for; it never gave more.
    if (file) fchmod(file.get(), mode);
    return file;
}

bool replace_file(const std::string &path, mode_t mode, std::string_view contents)
{
    std::remove(path.c_str());
    const UniqueFd file = create_file(path, mode);
    if (!file) return false;
    if (write_all(file.get(), contents)) return true;
    const int why = errno;
    unlink(path.c_str());
    errno = why;
    return false;
}

UniqueFd open_own_file(const std::string &path, int flags)
{
    UniqueFd file(open(path.c_str(), flags | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    if (!file) return file;
    struct stat status = {};
    if (fstat(file.get(), &status) == 0 && S_ISREG(status.st_mode) && status.st_uid == geteuid() &&
        status.st_nlink == 1) {
        return file;
    }
    file.reset();
    errno = EPERM;
    return file;
}

bool is_at(const std::string &path, int file)
{
    struct stat there = {};
    struct stat here = {};
    return lstat(path.c_str(), &there) == 0 && fstat(file, &here) == 0 && there.st_ino == here.st_ino &&
           there.st_dev == here.st_dev;
}

bool is_directory(const std::string &path)
{
    struct stat status = {};
    return lstat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

} // namespace bakjob
