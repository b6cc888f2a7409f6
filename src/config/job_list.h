#pragma once

// All jobs of the configuration store, in the store's order. The list is a short-lived working set: load it
// whole, read or change records, and end with rsync_save_jobs or rsync_free_jobs, which empty it. Whoever
// needs a job beyond that keeps a copy.
//
// A function without a list as its argument works on the process's one list.

#include "config/job.h"
#include "config/record_list.h"

#include <memory>
#include <string_view>

namespace bakjob
{

struct RsyncJobList : RecordList<RsyncJob> {
    const char *load_failure; // why the last load left something out, in words; null when it did not
};

extern RsyncJobList *const job_list; // the process's one list

// 1 when the list holds no record, else 0.
int rsync_job_list_empty();

// A zero-filled record, or null without memory. Release it with delete.
RsyncJob *rsync_new_job();

// Appends a copy of `source` with its defaults: an empty password becomes the default one, an empty port
// "873", and plain passwords (`pwd_encoded` 0) are brought into base64. Passwords too long for that stay
// plain, both of them. 0 when the name is already in the list or memory is short, else 1.
int rsync_list_add_job(RsyncJobList &jobs, const RsyncJob &source);
int rsync_list_add_job(const RsyncJob &source);

// The same with the record itself, for a caller who knows that its name is new.
void rsync_list_take_job(RsyncJobList &jobs, std::unique_ptr<RsyncJob> job);

// The record of that name, byte for byte, or null. Valid until the list is emptied.
RsyncJob *rsync_find_job(const RsyncJobList &jobs, std::string_view job_name);
RsyncJob *rsync_find_job(std::string_view job_name);

// Unlinks and frees a record. 0 when it is null or not in the list, else 1.
int rsync_list_remove_job(RsyncJob *job);

// Frees every record.
void rsync_free_jobs();

} // namespace bakjob
