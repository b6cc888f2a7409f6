#pragma once

// From a job's source folders to their place on the remote side: which network share holds a folder, where
// its data lives remotely, and which folder of how many is being transferred. Remotely a job's data lies
// below its `remote_path` in SERIAL_remote_backup/JOB/SHARE/FOLDER.

#include "common/folder_table.h"
#include "common/job_name.h"
#include "common/refusal.h"
#include "config/job.h"

#include <cstddef>
#include <string>

namespace bakjob
{

inline constexpr std::size_t SERIAL_SIZE = 128;

// Splits the job's `local_path` into the table, in place. Folders that the table cannot hold, and a last one
// that the store had to cut, are counted as left out.
void rsync_split_folders(RsyncJob &job, FolderTable &table);

// Finds the first share that holds the folder, fills the share buffers and changes the working directory to
// the share's path. A refusal when no share holds it, it has a ".." step, a text does not fit, or the share's
// path cannot be entered.
Refusal enter_share(const std::string &remote_backup_root, const std::string &folder);

// The same: 0, or -1 when refused.
int rsync_resolve_folder(const std::string &remote_backup_root, const std::string &folder);

// The folder below a job's `remote_path` in which all its data lies, "/SERIAL_remote_backup/JOB". Refused
// when the serial text is: without it, or with a wrong one, the data would be looked for elsewhere.
Checked rsync_remote_root(const JobName &job);

// Points the job at the two ends of the folder that was just resolved: `local_path` at the folder, in a
// restore run at its share, `remote_path` at the folder's place. A refusal when they do not fit.
Refusal set_ends(RsyncJob &job, const std::string &folder);

// Publishes which folder (`index` from 1 of `count`) is being transferred.
void rsync_write_progress(const JobName &job, const std::string &folder, int index, int count);
void rsync_remove_progress(const JobName &job);

// Reads the device's serial text: the first line of its file, line break included, at most 127 bytes. -1, and
// the buffer untouched, when there is none or it is refused.
int rsync_read_serial(char (&serial)[SERIAL_SIZE]);

// Why the serial file is refused: others than root could have written it, or its text leads elsewhere. Empty
// when it is not.
std::string rsync_serial_refusal();

} // namespace bakjob
