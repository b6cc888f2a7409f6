#include "atomic_file.h"
#include "platform/device.h"
#include "store.h"
#include "store_paths.h"
#include "xml_tree.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <new>
#include <string>
#include <sys/stat.h>

using bakjob::UniqueFd;
using namespace device;

namespace
{

// Null, or why the file's contents are no configuration.
const char *read_configuration(const char *path, std::string &contents)
{
    const UniqueFd source(open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!source || !read_whole(source.get(), contents)) return std::strerror(errno);
    pugi::xml_document document;
    return parse_tree(document, contents);
}

// What is in flash may be the only good copy.
const char *copy_to_flash()
{
    std::string contents;
    if (const char *const why = read_configuration(STORE_FILE, contents)) return why;
    if (mkdir(FLASH_FOLDER, 0700) < 0 && errno != EEXIST) return std::strerror(errno);
    return replace_file(FLASH_FILE, contents, {.mode = 0600}).on_disk ? nullptr : std::strerror(errno);
}

const char *copy_or_say_why()
{
    try {
        return copy_to_flash();
    } catch (const std::bad_alloc &) {
        return std::strerror(ENOMEM);
    }
}

} // namespace

FlashCopy device::flash_copy()
{
    struct stat status = {};
    if (lstat(FLASH_FILE, &status) < 0 && errno == ENOENT) return FlashCopy::NONE;
    std::string contents;
    return read_configuration(FLASH_FILE, contents) == nullptr ? FlashCopy::GOOD : FlashCopy::UNREADABLE;
}

int LIB_CP_Config_To_MTD(int how)
{
    if (how != 1) return -1;
    const char *const why = copy_or_say_why();
    if (why == nullptr) return 0;
    std::fprintf(stderr, "flash: %s is not copied: %s\n", STORE_FILE, why);
    return -1;
}
