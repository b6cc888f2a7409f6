#include "store_file.h"

#include "atomic_file.h"
#include "store.h"
#include "store_paths.h"

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <utility>

using bakjob::UniqueFd;

namespace device
{

namespace
{

constexpr mode_t STORE_MODE = 0600; // it holds passwords

FileVersion version_of(const struct stat &status)
{
    return {0, status.st_dev, status.st_ino, status.st_size, status.st_mtim.tv_sec, status.st_mtim.tv_nsec};
}

// An empty tree in place of a lost one would be saved, and then copied over the last good copy.
const char *reason_of_missing_file()
{
    struct stat status = {};
    if (lstat(STORE_FILE, &status) == 0) return "it is a link to a file that is not there";
    switch (flash_copy()) {
    case FlashCopy::NONE:
        return nullptr;
    case FlashCopy::GOOD:
        return "it is missing, but its copy in flash is there; "
               "cp -p /var/lib/device_flash/config.xml /etc/NAS_CFG/config.xml brings it back";
    case FlashCopy::UNREADABLE:
        break;
    }
    return "it is missing, and its copy in flash, /var/lib/device_flash/config.xml, cannot be read; nothing "
           "is "
           "written over either. Mend one, or move the copy away to begin anew";
}

// The file behind the store's name, which may be a link, and its owner and mode: only the owner may read it.
struct Target {
    std::string path = STORE_FILE;
    FileOwner owner{.mode = STORE_MODE};
};

Target target()
{
    Target found;
    struct stat status = {};
    if (stat(STORE_FILE, &status) < 0) return found;
    found.owner = {status.st_mode & STORE_MODE, status.st_uid, status.st_gid};
    char resolved[PATH_MAX];
    if (realpath(STORE_FILE, resolved) != nullptr) found.path = resolved;
    return found;
}

} // namespace

FileVersion current_version()
{
    struct stat status = {};
    if (stat(STORE_FILE, &status) < 0) return {.error = errno};
    return version_of(status);
}

const char *read_store_file(StoreFile &opened, std::string &text)
{
    constexpr int ANY_TIME = -1;
    // Do not wait for a fifo of that name.
    opened.file = UniqueFd(open(STORE_FILE, O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    opened.version = {.error = ANY_TIME};
    if (!opened.file) {
        const char *const why = errno == ENOENT ? reason_of_missing_file() : std::strerror(errno);
        if (!why) opened.version = {.error = ENOENT};
        return why;
    }
    const int file = opened.file.get();
    struct stat before = {};
    struct stat after = {};
    if (fstat(file, &before) < 0) return std::strerror(errno);
    if (!S_ISREG(before.st_mode)) return "not a regular file";
    if (!read_whole(file, text) || fstat(file, &after) < 0) return std::strerror(errno);
    // A change in place shows in the file's time or size.
    if (version_of(before) != version_of(after)) return "somebody writes into it";
    opened.version = version_of(before);
    return nullptr;
}

const char *replace_store_file(StoreFile &opened, const std::string &text)
{
    if (opened.version != current_version()) return "somebody else has changed it meanwhile";
    const Target where = target();
    Replaced replaced = replace_file(where.path, text, where.owner);
    struct stat status = {};
    if (!replaced.file || fstat(replaced.file.get(), &status) < 0) return std::strerror(errno);
    opened.version = version_of(status);
    opened.file = std::move(replaced.file);
    return replaced.on_disk ? nullptr : "it is written, but perhaps not to disk";
}

} // namespace device
