#include "atomic_file.h"

#include "common/text.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <dirent.h>
#include <fcntl.h>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

using bakjob::UniqueFd;

namespace device
{
namespace
{

constexpr std::string_view TEMPORARY_MARK = ".new.";

struct CloseFolder {
    void operator()(DIR *folder) const { closedir(folder); }
};

std::string folder_of(const std::string &path)
{
    const std::size_t slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

std::string name_of(const std::string &path)
{
    return path.substr(path.rfind('/') + 1);
}

// The process that a temporary file whose name has this start belongs to; 0 for another file.
pid_t owner_of(std::string_view name, std::string_view start)
{
    if (!name.starts_with(start)) return 0;
    name.remove_prefix(start.size());
    return std::max(bakjob::whole_number<pid_t>(name).value_or(0), 0);
}

void remove_leftovers(const std::string &folder, const std::string &start)
{
    const std::unique_ptr<DIR, CloseFolder> entries(opendir(folder.c_str()));
    if (!entries) return;
    while (const dirent *entry = readdir(entries.get())) {
        const pid_t owner = owner_of(entry->d_name, start);
        if (owner == 0) continue;
        const bool gone = owner == getpid() || (kill(owner, 0) < 0 && errno == ESRCH);
        if (gone) unlinkat(dirfd(entries.get()), entry->d_name, 0);
    }
}

// The rename is on disk only when the folder is.
bool sync_folder(const std::string &folder)
{
    const UniqueFd fd(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    return fd && (fsync(fd.get()) == 0 || errno == EINVAL); // EINVAL: this file system cannot sync folders
}

} // namespace

Replaced replace_file(const std::string &path, std::string_view contents, const FileOwner &owner)
{
    const std::string folder = folder_of(path);
    const std::string start = name_of(path) + std::string(TEMPORARY_MARK);
    remove_leftovers(folder, start);

    const std::string temporary = path + std::string(TEMPORARY_MARK) + std::to_string(getpid());
    UniqueFd fd(open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600));
    if (!fd) return {};
    const bool replaced = fchown(fd.get(), owner.user, owner.group) == 0 &&
                          fchmod(fd.get(), owner.mode) == 0 && bakjob::write_all(fd.get(), contents) &&
                          fsync(fd.get()) == 0 && std::rename(temporary.c_str(), path.c_str()) == 0;
    if (!replaced) {
        const int reason = errno;
        unlink(temporary.c_str());
        errno = reason;
        return {};
    }
    const bool on_disk = sync_folder(folder);
    return {std::move(fd), on_disk};
}

bool read_whole(int fd, std::string &contents)
{
    contents.clear();
    std::array<char, 65536> piece{};
    for (;;) {
        const ssize_t count = read(fd, piece.data(), piece.size());
        if (count < 0 && errno == EINTR) continue;
        if (count <= 0) return count == 0;
        contents.append(piece.data(), static_cast<std::size_t>(count));
    }
}

} // namespace device
