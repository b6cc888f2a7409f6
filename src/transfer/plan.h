#pragma once

// What the transfer of one folder takes: made before anything is done, so that it can be looked at, and then
// carried out by backup.h. The command alone is made right before it is run: a probe takes time enough for
// somebody to put a link in the place of the folder.

#include "common/reason.h"
#include "common/refusal.h"
#include "config/job.h"

#include <string>
#include <vector>

namespace bakjob
{

struct TransferPlan {
    Refusal refusal;              // no run takes such a job
    std::vector<RunStep> steps;   // in this order; the first that fails ends it
    std::vector<std::string> row; // nothing but folders may stand at these paths
    std::string newest;           // snapshot that the transfer writes into; empty: none

    [[nodiscard]] bool has(RunStep step) const;
};

// For a job with one folder. Asks nobody.
TransferPlan plan_transfer(const RsyncJob &job);

// The transfer's command, for the job and the same job with its defaults, whose dry run fits, too. Looks at
// the folder.
Checked planned_command(const RsyncJob &job, const RsyncJob &filled);

// The two forms in which the command is run, its dry run first.
std::string dry_run_of(const std::string &command);
std::string with_dump_size(const std::string &command);

} // namespace bakjob
