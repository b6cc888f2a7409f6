#pragma once

// The modules that a remote rsync server offers, and the sizes that belong to them. Filled by the module
// discovery, which empties it first; kept until the next discovery.

#include "config/record_list.h"

#include <string_view>

namespace bakjob
{

// A size as df and du print it for people, such as "1.8T" or "4.0K".
using SizeText = char[32];
inline constexpr const char *UNKNOWN_SIZE = "N/A";

inline constexpr int VOLUMES = 4;
inline constexpr const char *VOLUME_NAMES[VOLUMES] = {"HD_a2", "HD_b2", "HD_c2", "HD_d2"};

struct RemoteModule {
    char name[128];
    char path[1024]; // its folder on the remote host, empty when unknown
    SizeText du_size;
    RemoteModule *next;
};

struct RemoteModuleList : RecordList<RemoteModule> {
    SizeText remote_free[VOLUMES]; // free space of the remote volumes
    SizeText remote_size;          // of the job's remote path
    SizeText local_free[VOLUMES];  // free space of the volumes here
    SizeText local_size;           // of the job's local folders
};

extern RemoteModuleList *const module_list; // the process's one list

// 1 when the list holds no module, else 0.
int rsync_module_list_empty();

// A zero-filled record, or null without memory. Release it with delete.
RemoteModule *rsync_new_module();

// The module of that name, byte for byte, or null.
RemoteModule *rsync_find_module(std::string_view name);

// Copies name, path and size; `next` stays.
void rsync_copy_module(RemoteModule &destination, const RemoteModule &source);

// Appends a copy, or answers the module that has the name already, unchanged. Null without memory.
RemoteModule *rsync_add_module(const RemoteModule &source);

// Overwrites the texts of the module of that name, if there is one.
void rsync_update_module(const RemoteModule &source, std::string_view name);

// Unlinks and frees a record. 0 when it is null or not in the list, else 1.
int rsync_remove_module(RemoteModule *module);

// Frees every record; the size texts stay.
void rsync_free_modules();

// Writes three lines for each module to standard output.
void rsync_print_modules();

} // namespace bakjob
