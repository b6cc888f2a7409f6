#pragma once

// The appliance's configuration store: one XML tree for all of its parts, kept in
// "/etc/NAS_CFG/config.xml" and addressed by paths such as "/backup_mgr/rsync/item:2/job_name".
// A step "name:N" is the N-th node of that name, counted from 1; deleting one renumbers those behind it.
// Changes stay in this process until xml_write_file.

// What a call answers instead of reading or writing when the store as a whole cannot be had: its file is
// damaged, could not be read, or has changed since what is to be changed was read.
inline constexpr int XML_UNREADABLE = -2;

extern "C" {

// Copies the text at `path` into `buffer`, at most `size` bytes with the terminator. A path that does not
// exist leaves the buffer as it was and gives a negative result, but not XML_UNREADABLE.
int xml_get_str(const char *path, int size, char *buffer);

// The integer at `path`, or -1 when there is none.
int xml_get_int(const char *path);

// Create or overwrite the value at `path`, with every node above it. XML_UNREADABLE when that fails: then
// xml_write_file fails, too, and all changes since the last write are dropped.
int xml_set_str(const char *path, const char *text);
int xml_set_int(const char *path, int value);

// Removes the node at `path` with everything below it. Negative when there is no such node; XML_UNREADABLE is
// a failure as those above.
int xml_del(const char *path);

// Writes the whole tree to the named file. On failure (negative) the file is as it was, or, when only its
// folder could not be brought to disk, perhaps as it was after a power cut.
int xml_write_file(const char *file_name);
}
