#include "cli/broken_run.h"

#include "cli/job_state.h"
#include "cli/run_processes.h"
#include "cli/source_folders.h"
#include "common/debug_log.h"
#include "common/interrupt.h"
#include "common/job_files.h"

#include <exception>
#include <unistd.h>

namespace bakjob
{

namespace
{

constexpr int GRACE = 5;     // seconds
constexpr int LOCK_WAIT = 5; // seconds

template <class Step>
void attempt(const Step &step)
{
    try {
        step();
    } catch (const std::exception &why) {
        DebugLog("ERROR: the run's end: %s\n", why.what());
    }
}

} // namespace

void rsync_end_broken_run(const JobName &job, const PidFile &pid_file) noexcept
{
    if (noted_interrupt() != 0) DebugLog("ERROR: interrupted by signal %d\n", noted_interrupt());
    attempt([] { RunProcesses(getpid(), true).end(GRACE); });
    attempt([&] {
        limit_waits(LOCK_WAIT);
        rsync_record_interruption(job.text());
    });
    attempt([&] { unlink(password_file(job).c_str()); });
    attempt([&] { unlink(remote_config_copy(job).c_str()); });
    attempt([&] { rsync_remove_progress(job); });
    rsync_remove_pid_file(pid_file);
}

} // namespace bakjob
