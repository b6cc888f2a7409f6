#pragma once

// The cycle of every change of a job: lock the configuration, load the jobs, change them, save, and for some
// copy the configuration to flash. Nobody else changes a job meanwhile.

#include "common/handles.h"
#include "config/job_list.h"

#include <functional>

namespace bakjob
{

enum class ChangeResult {
    UNCHANGED,   // `change` did not want it saved
    SAVED,       //
    NOT_LOCKED,  // no lock could be had (errno), nothing was done
    NOT_LOADED,  // the list's load_failure tells why; nothing was saved
    NOT_SAVED,   // a value could not be set, or the configuration file could not be written
    NOT_IN_FLASH // saved, but the copy to flash failed
};

enum class ToFlash {
    NEVER,
    WHEN_SAVED,
    WHEN_LOADED // even when the save failed: flash then gets what the file has
};

struct ChangeRules {
    bool needs_lock = false; // false: the change is made without a lock when there is none
    bool needs_all = true;   // false: `change` is also called when the list may lack a job
    ToFlash to_flash = ToFlash::NEVER;
};

struct JobChange {
    ChangeResult result;
    UniqueFd lock; // still held, for what is to be done before the next change

    [[nodiscard]] bool saved() const
    {
        return result == ChangeResult::SAVED || result == ChangeResult::NOT_IN_FLASH;
    }
};

// `change` works on the process's list, loaded, and says whether to save it. The list is empty afterwards.
JobChange rsync_change_jobs(const std::function<bool(RsyncJobList &jobs)> &change,
                            const ChangeRules &rules = {});

// Whether a save of this process was broken off by an exception, so that the configuration in its memory may
// be half changed.
bool rsync_save_broken_off();

} // namespace bakjob
