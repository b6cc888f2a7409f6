#pragma once

// Keeps a job from running twice, and stops it: a pid file per job, and the job's name on the command line of
// each of its rsync processes.

#include "common/handles.h"
#include "common/job_name.h"

#include <string>
#include <sys/types.h>

namespace bakjob
{

// Whether nothing stands where the job's pid file would. A file left behind by a run that died counts as a
// running job until rsync_kill_job removes it.
bool rsync_pid_file_absent(const JobName &job);

// A pid file: what it says, and an open handle, which tells it from a later file of that name.
struct PidFile {
    std::string path;
    UniqueFd handle; // empty: there is no file
    pid_t process;   // 0: the file holds no process id
    bool is_run;     // the process is one that runs the job, by its command line
};

// Creates the pid file together with this process's id in it. An empty handle (errno) when that fails;
// EEXIST: another run was quicker.
PidFile rsync_write_pid_file(const JobName &job);

PidFile rsync_read_pid_file(const JobName &job);

// The process that the job's pid file names, if it runs the job; else 0, also when another process has got
// its number.
pid_t rsync_running_process(const JobName &job);

// Removes the file if it still stands at its path. 0 when it is gone by that, else -1. Takes no memory.
int rsync_remove_pid_file(const PidFile &file) noexcept;

// The listing of processes that works here: "ps -ww" or "ps".
std::string rsync_ps_command();

// Kills the process that the pid file names, and notes in `restore_mode` whether it was a restore run. The
// kill command's wait status, 0 for success; -1 without a pid file or when it holds no process id.
int rsync_kill_job_process(const JobName &job);

// Kills every rsync process whose command line holds "job-name=" followed by the name.
void rsync_kill_transfers(const JobName &job);

} // namespace bakjob
