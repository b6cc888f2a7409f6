#include "config/job_change.h"

#include "common/job_files.h"
#include "config/config_lock.h"
#include "config/job_store.h"
#include "platform/device.h"

#include <utility>

namespace bakjob
{

namespace
{

bool saving = false; // and still true behind a save that threw

ChangeResult save(RsyncJobList &jobs, ToFlash to_flash)
{
    const bool whole = jobs.load_failure == nullptr;
    saving = true;
    const bool saved = rsync_save_jobs(jobs);
    saving = false;
    // A configuration that could not be loaded whole may be damaged, and its copy in flash may not be.
    const bool copies = to_flash == ToFlash::WHEN_SAVED ? saved : to_flash == ToFlash::WHEN_LOADED && whole;
    const bool in_flash = !copies || LIB_CP_Config_To_MTD(1) >= 0;
    if (!whole) return ChangeResult::NOT_LOADED;
    if (!saved) return ChangeResult::NOT_SAVED;
    return in_flash ? ChangeResult::SAVED : ChangeResult::NOT_IN_FLASH;
}

ChangeResult load_and_change(const std::function<bool(RsyncJobList &jobs)> &change, const ChangeRules &rules)
{
    RsyncJobList &jobs = *job_list;
    if (!rsync_load_jobs(jobs) && rules.needs_all) {
        jobs.clear();
        return ChangeResult::NOT_LOADED;
    }
    if (change(jobs)) return save(jobs, rules.to_flash);
    jobs.clear();
    return ChangeResult::UNCHANGED;
}

} // namespace

JobChange rsync_change_jobs(const std::function<bool(RsyncJobList &jobs)> &change, const ChangeRules &rules)
{
    UniqueFd lock = rsync_lock_config(CONFIG_LOCK_FILE);
    if (!lock && rules.needs_lock) return {ChangeResult::NOT_LOCKED, UniqueFd()};
    const ChangeResult result = load_and_change(change, rules);
    return {result, std::move(lock)};
}

bool rsync_save_broken_off()
{
    return saving;
}

} // namespace bakjob
