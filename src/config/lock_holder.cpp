#include "config/lock_holder.h"

#include "common/text.h"

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <system_error>
#include <unistd.h>

namespace fs = std::filesystem;

namespace bakjob
{

namespace
{

std::string program_of(pid_t process)
{
    std::string name;
    std::ifstream file("/proc/" + std::to_string(process) + "/comm");
    std::getline(file, name);
    return printable(name);
}

// The process in a line of the kernel's about a lock at that place: its number, "->" for one that waits,
// kind, rule, access, process, place. 0 for one that has ended since it took the lock; nullopt: another lock.
std::optional<pid_t> flock_in(const std::string &line, const std::string &place)
{
    std::istringstream words(line);
    std::string number;
    std::string kind;
    std::string rule;
    std::string access;
    std::string at;
    pid_t process = 0;
    words >> number >> kind >> rule >> access >> process >> at;
    return kind == "FLOCK" && at == place ? std::optional(process) : std::nullopt;
}

bool has_locked(const fs::path &process, const std::string &place)
{
    std::error_code none;
    for (const auto &handle : fs::directory_iterator(process / "fdinfo", none)) {
        std::ifstream info(handle.path());
        for (std::string line; std::getline(info, line);) {
            if (line.starts_with("lock:") && flock_in(line.substr(5), place)) return true;
        }
    }
    return false;
}

std::optional<LockHolder> listed_holder(const std::string &place)
{
    std::ifstream locks("/proc/locks");
    for (std::string line; std::getline(locks, line);) {
        const auto process = flock_in(line, place);
        if (process > 0) return LockHolder{*process, program_of(*process), false};
    }
    return std::nullopt;
}

} // namespace

std::optional<LockHolder> flock_holder(int file)
{
    struct stat status = {};
    if (fstat(file, &status) != 0) return std::nullopt;
    const std::string place = format_text("%02x:%02x:%ju", major(status.st_dev), minor(status.st_dev),
                                          static_cast<std::uintmax_t>(status.st_ino));
    std::optional<LockHolder> holder;
    std::error_code none;
    for (const auto &entry : fs::directory_iterator("/proc", none)) {
        const auto process = whole_number<pid_t>(entry.path().filename().native());
        if (!process || !has_locked(entry.path(), place)) continue;
        const bool neighbour = stat(entry.path().c_str(), &status) != 0 || status.st_uid != geteuid();
        if (!holder || !neighbour) holder = LockHolder{*process, program_of(*process), neighbour};
    }
    return holder ? holder : listed_holder(place);
}

} // namespace bakjob
