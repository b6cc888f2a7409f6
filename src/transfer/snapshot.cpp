#include "transfer/snapshot.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/run_options.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/job.h"

#include <sys/stat.h>
#include <unistd.h>
#include <utime.h>

namespace bakjob
{

namespace
{

std::string snapshot_path(const std::string &folder, const std::string &job_name, int number)
{
    return folder + '/' + snapshot_name(job_name, number);
}

void run_step(const std::string &command, const std::string &from, const std::string &to)
{
    struct stat status = {};
    const bool has_times = stat(from.c_str(), &status) == 0;
    run_shell(command);
    if (has_times && !to.empty()) {
        const utimbuf times{.actime = status.st_atime, .modtime = status.st_mtime};
        utime(to.c_str(), &times);
    }
    DebugLog("[%s]\n", command.c_str());
}

} // namespace

std::string rotation_command(const std::string &escaped_folder, const std::string &job_name, int number,
                             int top)
{
    const auto word = [&](int n) { return escaped_folder + '/' + escape_path(snapshot_name(job_name, n)); };
    if (number == top) return "rm -rf " + word(number);
    return (number == 0 ? "cp -al " : "mv ") + word(number) + ' ' + word(number + 1);
}

void rsync_snapshot_rotate(const std::string &local_path, int inc_number, const std::string &job_name)
{
    if (local_path.empty()) return;
    const auto escaped = shell_path("local_path", local_path);
    const int top = snapshots_kept(inc_number) - 1;
    const bool named = job_name.empty() || is_job_name(job_name);
    // All of a rotation or nothing: without the copy of 0, the transfer would overwrite it.
    if (!escaped || !named || !fits_command(rotation_command(*escaped, job_name, 0, top))) {
        DebugLog("ERROR: snapshots refused: job_name or local_path\n");
        return;
    }
    for (int number = top; number >= 0; --number) {
        const std::string path = snapshot_path(local_path, job_name, number);
        DebugLog("[%s]\n", path.c_str());
        if (number == 0) copy_text(run_options.inc_root_path, path);
        if (access(path.c_str(), F_OK) != 0) continue;
        run_step(rotation_command(*escaped, job_name, number, top), path,
                 number == top ? "" : snapshot_path(local_path, job_name, number + 1));
    }
}

} // namespace bakjob
