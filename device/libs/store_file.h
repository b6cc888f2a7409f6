#pragma once

// The store's file: which version is there now, and reading and replacing it whole.

#include "common/handles.h"

#include <ctime>
#include <string>
#include <sys/types.h>

namespace device
{

// Tells one state of the file from another, as far as its inode, size and time do.
struct FileVersion {
    int error = 0; // of stat; ENOENT when there is no file
    dev_t device = 0;
    ino_t inode = 0;
    off_t size = 0;
    time_t seconds = 0;
    long nanoseconds = 0;

    bool operator==(const FileVersion &) const = default;
};

FileVersion current_version();

struct StoreFile {
    FileVersion version;
    bakjob::UniqueFd file; // stays open, so that no later file can have the same inode
};

// Opens and reads the file. Null, or why it is not to be used; null with an empty text when there is no file
// and none is missing. After a failure that may pass, the version is one that no file has.
const char *read_store_file(StoreFile &opened, std::string &text);

// Replaces the `opened` file by one with this text, which becomes the opened one. A link stays, and its
// target is replaced; owner and a stricter mode are kept. Null, or why not: then the file is as it was, or,
// when only its folder could not be synced, the new one.
const char *replace_store_file(StoreFile &opened, const std::string &text);

} // namespace device
