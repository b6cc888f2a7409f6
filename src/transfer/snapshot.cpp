#include "transfer/snapshot.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/run_options.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/job.h"
#include "transfer/row_guard.h"
#include "transfer/snapshot_mark.h"

#include <array>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace bakjob
{

namespace
{

struct Step {
    std::string command;
    std::string from;
    std::string to; // empty for the oldest, which is removed
    bool copies;    // and leaves `from` as it is
};

bool exists(const std::string &path)
{
    return access(path.c_str(), F_OK) == 0;
}

// Where the step's snapshot ends up in a folder that is at its target already.
std::string name_inside(const std::string &folder, const Step &step)
{
    return folder + step.from.substr(step.from.rfind('/'));
}

// The exit code.
int run_command(const Step &step)
{
    struct stat status = {};
    const bool has_times = stat(step.from.c_str(), &status) == 0;
    const int code = exit_code(run_shell(step.command));
    if (has_times && !step.to.empty()) {
        const std::array<timespec, 2> times{timespec{.tv_sec = status.st_atime, .tv_nsec = 0},
                                            timespec{.tv_sec = status.st_mtime, .tv_nsec = 0}};
        utimensat(AT_FDCWD, step.to.c_str(), times.data(), AT_SYMLINK_NOFOLLOW);
    }
    DebugLog("[%s]\n", step.command.c_str());
    return code;
}

// Whether the row is still one of folders, none of which claims to be whole without being so. A step may be
// killed together with this process, so while it works nothing that it changes is marked.
bool run_step(const Step &step)
{
    if (!are_folders({step.from, step.to})) return false;
    const bool was_whole = is_marked_whole(step.from);
    if (!step.copies && !take_mark_away(step.from)) return false;
    bool in_the_way = !step.to.empty() && exists(step.to);
    const bool holds_its_name = exists(name_inside(step.from, step));

    const int code = run_command(step);
    in_the_way |= !step.to.empty() && !holds_its_name && exists(name_inside(step.to, step));
    if (code == 0 && !in_the_way) {
        if (was_whole && !step.to.empty()) mark_whole(step.to);
        return true;
    }
    DebugLog("ERROR: snapshots: [%s] failed: %s\n", step.command.c_str(),
             code == 0 ? "its target was there" : format_text("exit code %d", code).c_str());
    return step.to.empty() || take_mark_away(step.to);
}

} // namespace

std::string rotation_command(const std::string &escaped_folder, const std::string &job_name, int number,
                             int top)
{
    const auto word = [&](int n) { return escaped_folder + '/' + escape_path(snapshot_name(job_name, n)); };
    if (number == top) return "rm -rf " + word(number);
    return (number == 0 ? "cp -al " : "mv ") + word(number) + ' ' + word(number + 1);
}

bool rsync_snapshot_rotate(const std::string &local_path, int inc_number, const std::string &job_name)
{
    if (local_path.empty()) return true;
    const auto escaped = shell_path("local_path", local_path);
    const int top = snapshots_kept(inc_number) - 1;
    const bool named = job_name.empty() || is_job_name(job_name);
    // All of a rotation or nothing: without the copy of 0, the transfer would overwrite it.
    if (!escaped || !named || !fits_command(rotation_command(*escaped, job_name, 0, top))) {
        DebugLog("ERROR: snapshots refused: job_name or local_path\n");
        return true;
    }
    for (int number = top; number >= 0; --number) {
        const std::string path = snapshot_path(local_path, job_name, number);
        DebugLog("[%s]\n", path.c_str());
        if (number == 0) copy_text(run_options.inc_root_path, path);
        if (!exists(path)) continue;
        const std::string next = number == top ? "" : snapshot_path(local_path, job_name, number + 1);
        if (!run_step({rotation_command(*escaped, job_name, number, top), path, next, number == 0})) {
            return false;
        }
    }
    return true;
}

} // namespace bakjob
