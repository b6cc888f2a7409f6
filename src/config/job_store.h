#pragma once

// The jobs in the configuration store: "/backup_mgr/rsync/count" and the items "/backup_mgr/rsync/item:1" to
// count, each with the keys of job_fields. Whoever saves holds the configuration lock (config_lock.h) from
// before the load until after the save.

#include "config/job_list.h"

namespace bakjob
{

// Empties the list and fills it with every job of the store. Texts are cut at their field's width, and
// `whole_texts` has them whole; numbers out of their range take their default; the second of two jobs of one
// name is left out. False, with a trace and the list's `load_failure`, when the store may have more than the
// list: it could not be read, its count cannot be right, memory ended, or a text is longer than 1 MiB.
bool rsync_load_jobs(RsyncJobList &jobs);
bool rsync_load_jobs();

// Writes the list in place of the stored jobs, numbered from 1, deletes scheduler entries that name no job
// any more, writes the configuration file and empties the list. A text that the load had to cut is saved
// whole unless it was changed. False, with nothing written, when the last load left something out or a value
// could not be set, and when the file could not be written.
bool rsync_save_jobs(RsyncJobList &jobs);
bool rsync_save_jobs();

} // namespace bakjob
