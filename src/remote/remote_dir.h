#pragma once

// Makes a missing folder below a module of the remote rsync daemon, over ssh.

#include "common/job_name.h"
#include "common/refusal.h"
#include "config/job.h"

#include <optional>
#include <string>

namespace bakjob
{

// A module's folder, looked up in the configuration of the job's remote daemon. `name` is in the name of the
// local copy of that, which is gone afterwards.
Checked find_module_folder(const RsyncJob &job, const JobName &name, const std::string &module);

// Makes "first/second" below the module's folder, open to every user.
struct MadeFolder {
    int status;  // the wait status of the remote command; -1: there was none
    Refusal why; // that is so
};
MadeFolder make_remote_folder(const RsyncJob &job, const JobName &name, const std::string &module,
                              const std::string &first, const std::string &second);

// The same with the host and the password of CurrentJob.
std::optional<std::string> rsync_find_module_folder(const JobName &job, const std::string &module);
int rsync_prepare_remote_dir(const JobName &job, const std::string &module, const std::string &first,
                             const std::string &second);

} // namespace bakjob
