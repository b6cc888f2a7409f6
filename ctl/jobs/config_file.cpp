#include "jobs/config_file.h"

#include "common/job_files.h"

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

namespace bakjob::ctl
{

namespace
{

// The target, when that name is a link.
std::filesystem::path config_path()
{
    std::error_code error;
    const auto path = std::filesystem::weakly_canonical(CONFIG_FILE, error);
    return error ? std::filesystem::path(CONFIG_FILE) : path;
}

bool has_room_for(std::uint64_t bytes, const struct statvfs &disk)
{
    if (disk.f_files > 0 && disk.f_ffree == 0) return false;
    return std::uint64_t{disk.f_bfree} * disk.f_frsize >= bytes;
}

} // namespace

std::string why_not_writable()
{
    const std::filesystem::path path = config_path();
    const std::string folder = path.parent_path();
    if (access(folder.c_str(), W_OK | X_OK) != 0) return folder + ": " + std::strerror(errno);
    struct stat file = {};
    struct statvfs disk = {};
    const std::uint64_t size = stat(path.c_str(), &file) == 0 ? static_cast<std::uint64_t>(file.st_size) : 0;
    // A new state makes it a little longer.
    constexpr std::uint64_t MORE = 4096;
    if (statvfs(folder.c_str(), &disk) != 0) return folder + ": " + std::strerror(errno);
    return has_room_for(size + MORE, disk) ? "" : folder + ": no room for another copy of the file";
}

} // namespace bakjob::ctl
