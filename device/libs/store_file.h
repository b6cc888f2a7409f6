#pragma once

// The store's file: which one stands there now, and reading and replacing it whole.

#include "common/handles.h"

#include <ctime>
#include <string>
#include <sys/types.h>

namespace device
{

// Tells one state of the file from another, as far as its inode, size and time do.
struct FileVersion {
    int error = 0; // of looking at it; ENOENT when there is no file
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

// Opens and reads the file. Null with an empty text when there is none and should be none; else null, or why
// it is not to be used. What may be another time different leaves a version that no file has.
const char *read_store_file(StoreFile &opened, std::string &text);

// Puts the text in the place of the file that was `opened`, which becomes the new one. A link stays, and what
// it names is replaced; owner and a stricter mode are kept. Null, or why not: then the file is as it was, or,
// when only its folder could not be synced, new all the same.
const char *replace_store_file(StoreFile &opened, const std::string &text);

} // namespace device
