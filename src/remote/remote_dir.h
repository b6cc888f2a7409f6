#pragma once

// Makes a missing folder below a module of the remote rsync daemon, over ssh.

#include "common/job_name.h"

#include <optional>
#include <string>

namespace bakjob
{

// Looks up the module's folder in the remote daemon's configuration (host and password of CurrentJob).
// `job` names the local copy of the configuration, which is gone afterwards.
std::optional<std::string> rsync_find_module_folder(const JobName &job, const std::string &module);

// Makes "first/second" below the module's folder, open to every user. The wait status of the remote command;
// -1 when the module's folder was not found or a value is refused.
int rsync_prepare_remote_dir(const JobName &job, const std::string &module, const std::string &first,
                             const std::string &second);

} // namespace bakjob
