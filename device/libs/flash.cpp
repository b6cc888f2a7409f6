#include "atomic_file.h"
#include "platform/device.h"
#include "store_paths.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>

using bakjob::UniqueFd;
using namespace device;

namespace
{

bool copy_to_flash()
{
    const UniqueFd source(open(STORE_FILE, O_RDONLY | O_CLOEXEC));
    std::string contents;
    if (!source || !read_whole(source.get(), contents)) return false;
    if (mkdir(FLASH_FOLDER, 0700) < 0 && errno != EEXIST) return false;
    return static_cast<bool>(replace_file(FLASH_FILE, contents, 0600));
}

} // namespace

int LIB_CP_Config_To_MTD(int how)
{
    if (how != 1) return -1;
    if (copy_to_flash()) return 0;
    std::fprintf(stderr, "flash: %s is not copied: %s\n", STORE_FILE, std::strerror(errno));
    return -1;
}
