#pragma once

// A state that could not be written into the configuration, for example on a full disk. It is kept in a file
// of its own, so that nobody takes the state before it for the present one. Backups and restores have a state
// each. Use under the configuration lock.

#include "common/job_name.h"

#include <cstdint>
#include <optional>
#include <string>

namespace bakjob
{

enum class StateKind { BACKUP, RESTORE };

struct UnrecordedState {
    std::int32_t state;
    std::string time; // as rsync_job_time writes it
};

// Keeps it in place of an earlier one of its kind. False (errno) when this file cannot be written either.
bool rsync_keep_unrecorded(const JobName &job, StateKind kind, const UnrecordedState &state);

// Nullopt when the configuration has the job's state of that kind.
std::optional<UnrecordedState> rsync_unrecorded_state(const JobName &job, StateKind kind);

// To be called when a state of that kind is in the configuration.
void rsync_forget_unrecorded(const JobName &job, StateKind kind);

// To be called when the job is deleted.
void rsync_forget_unrecorded(const JobName &job);

// To be called when the job gets another name. What an earlier job of that name has left is removed.
void rsync_rename_unrecorded(const JobName &job, const JobName &new_name);

} // namespace bakjob
