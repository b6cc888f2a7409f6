#include "config/lock_holder.h"

#include "common/text.h"

#include <cstdint>
#include <fstream>
#include <sstream>
#include <sys/stat.h>
#include <sys/sysmacros.h>

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

} // namespace

std::optional<LockHolder> flock_holder(int file)
{
    struct stat status = {};
    if (fstat(file, &status) != 0) return std::nullopt;
    const std::string wanted = format_text("%02x:%02x:%ju", major(status.st_dev), minor(status.st_dev),
                                           static_cast<std::uintmax_t>(status.st_ino));
    std::ifstream locks("/proc/locks");
    for (std::string line; std::getline(locks, line);) {
        std::istringstream words(line);
        std::string number;
        std::string kind; // "->" for one that waits
        std::string rule;
        std::string access;
        std::string place;
        pid_t process = 0;
        words >> number >> kind >> rule >> access >> process >> place;
        if (kind == "FLOCK" && place == wanted && process > 0)
            return LockHolder{process, program_of(process)};
    }
    return std::nullopt;
}

} // namespace bakjob
