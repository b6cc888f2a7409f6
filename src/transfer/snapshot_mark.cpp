#include "transfer/snapshot_mark.h"

#include "common/debug_log.h"
#include "common/handles.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <string_view>
#include <sys/xattr.h>
#include <unistd.h>

namespace bakjob
{

namespace
{

std::string_view name_of(const std::string &snapshot)
{
    return std::string_view(snapshot).substr(snapshot.rfind('/') + 1);
}

bool has_any_mark(const std::string &snapshot)
{
    return lgetxattr(snapshot.c_str(), SNAPSHOT_MARK, nullptr, 0) >= 0;
}

bool mark(const std::string &snapshot, bool write_out)
{
    const UniqueFd folder(open(snapshot.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    const std::string_view name = name_of(snapshot);
    if (folder && (!write_out || syncfs(folder.get()) == 0) &&
        fsetxattr(folder.get(), SNAPSHOT_MARK, name.data(), name.size(), 0) == 0) {
        return true;
    }
    // Where no mark can be, or nothing is to be marked, there is nothing to say.
    if (errno != ENOTSUP && errno != EPERM && errno != ENOENT) {
        DebugLog("ERROR: snapshot [%s] not marked as complete: %s\n", snapshot.c_str(), std::strerror(errno));
    }
    return false;
}

} // namespace

bool is_marked_whole(const std::string &snapshot)
{
    std::array<char, 256> value{}; // no folder's name is longer
    const ssize_t length = lgetxattr(snapshot.c_str(), SNAPSHOT_MARK, value.data(), value.size());
    return length > 0 &&
           std::string_view(value.data(), static_cast<std::size_t>(length)) == name_of(snapshot);
}

bool keeps_marks(const std::string &folder)
{
    return has_any_mark(folder) || errno != ENOTSUP;
}

bool mark_whole(const std::string &snapshot)
{
    return mark(snapshot, false);
}

bool write_out_and_mark_whole(const std::string &snapshot)
{
    return mark(snapshot, true);
}

Refusal take_mark_away(const std::string &snapshot)
{
    if (lremovexattr(snapshot.c_str(), SNAPSHOT_MARK) == 0) return {};
    const int why = errno;
    if (why == ENODATA || why == ENOENT || !has_any_mark(snapshot)) return {};
    return trace_refusal("snapshot [" + snapshot + "] still marked as complete: " + std::strerror(why));
}

} // namespace bakjob
