#include "transfer/plan.h"

#include "common/job_files.h"
#include "common/run_options.h"
#include "common/shell.h"
#include "transfer/row_guard.h"
#include "transfer/rsync_command.h"

#include <algorithm>

namespace bakjob
{

namespace
{

Refusal refusal_of_job(const RsyncJob &job)
{
    if (job.server_type != SERVER_SAME_KIND && job.server_type != SERVER_ANY) {
        return refused("server_type", std::to_string(job.server_type));
    }
    return refusal_of_cut_text(job);
}

std::vector<RunStep> steps_of(const RsyncJob &job)
{
    std::vector<RunStep> steps;
    if (job.use_ssh == 1) steps.push_back(RunStep::LOGIN);
    steps.push_back(RunStep::PASSWORD);
    if (!is_recover_run()) steps.push_back(RunStep::DAEMON);
    steps.insert(steps.end(), {RunStep::TARGET, RunStep::COMMAND});
    if (keeps_snapshots(job)) steps.push_back(RunStep::SNAPSHOTS);
    steps.push_back(RunStep::TRANSFER);
    return steps;
}

} // namespace

bool TransferPlan::has(RunStep step) const
{
    return std::find(steps.begin(), steps.end(), step) != steps.end();
}

TransferPlan plan_transfer(const RsyncJob &job)
{
    if (Refusal refusal = refusal_of_job(job)) return {refusal, {}, {}, ""};
    TransferPlan plan{{}, steps_of(job), snapshots_in_use(job), ""};
    if (plan.has(RunStep::SNAPSHOTS)) plan.newest = snapshot_path(job.local_path, job.job_name, 0);
    return plan;
}

Checked planned_command(const RsyncJob &job, const RsyncJob &filled)
{
    Checked command = transfer_command(job, filled);
    if (command && !fits_command(dry_run_of(*command))) return refused("transfer command", "too long");
    return command;
}

std::string with_dump_size(const std::string &command)
{
    return command + " --dump-size ";
}

std::string dry_run_of(const std::string &command)
{
    return with_dump_size(command) + " --dry-run >/dev/null 2>&1";
}

} // namespace bakjob
