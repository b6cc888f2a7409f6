#include "cli/broken_run.h"

#include "cli/run_processes.h"
#include "common/debug_log.h"
#include "common/interrupt.h"
#include "common/job_files.h"
#include "config/job_state.h"

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
    } catch (...) { // without memory there is nothing to say it with
    }
}

} // namespace

std::vector<std::string> rsync_files_of_run(const JobName &job)
{
    return {password_file(job), remote_config_copy(job), progress_file(job)};
}

void rsync_end_broken_run(const JobName &job, const PidFile &pid_file,
                          const std::vector<std::string> &files) noexcept
{
    attempt([] {
        if (noted_interrupt() != 0) DebugLog("ERROR: interrupted by signal %d\n", noted_interrupt());
    });
    bool ended = false;
    attempt([&] {
        RunProcesses(getpid(), true).end(GRACE);
        ended = true;
    });
    attempt([&] {
        limit_waits(LOCK_WAIT);
        rsync_record_interruption(job.text());
    });
    for (const std::string &file : files) {
        unlink(file.c_str());
    }
    // What may still be going on is not to meet another run.
    if (ended) rsync_remove_pid_file(pid_file);
}

} // namespace bakjob
