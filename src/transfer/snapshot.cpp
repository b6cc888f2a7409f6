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

bool exists(const std::string &path)
{
    return access(path.c_str(), F_OK) == 0;
}

// Where the step's snapshot ends up in a folder that is at its target already.
std::string name_inside(const std::string &folder, const RotationStep &step)
{
    return folder + step.from.substr(step.from.rfind('/'));
}

// The exit code.
int run_command(const RotationStep &step)
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

// A refusal when the row is not one of folders any more, or one of them claims to be whole without being so.
// A step may be killed together with this process, so while it works nothing that it changes is marked.
Refusal run_step(const RotationStep &step)
{
    if (Refusal refusal = refusal_of_row({step.from, step.to})) return refusal;
    const bool was_whole = is_marked_whole(step.from);
    if (!step.copies()) {
        if (Refusal refusal = take_mark_away(step.from)) return refusal;
    }
    bool in_the_way = !step.to.empty() && exists(step.to);
    const bool holds_its_name = exists(name_inside(step.from, step));

    const int code = run_command(step);
    in_the_way |= !step.to.empty() && !holds_its_name && exists(name_inside(step.to, step));
    if (code == 0 && !in_the_way) {
        if (was_whole && !step.to.empty()) mark_whole(step.to);
        return {};
    }
    DebugLog("ERROR: snapshots: [%s] failed: %s\n", step.command.c_str(),
             code == 0 ? "its target was there" : format_text("exit code %d", code).c_str());
    return step.to.empty() ? Refusal() : take_mark_away(step.to);
}

} // namespace

std::string rotation_command(const std::string &escaped_folder, const std::string &job_name, int number,
                             int top)
{
    const auto word = [&](int n) { return escaped_folder + '/' + escape_path(snapshot_name(job_name, n)); };
    if (number == top) return "rm -rf " + word(number);
    return (number == 0 ? "cp -al " : "mv ") + word(number) + ' ' + word(number + 1);
}

std::vector<RotationStep> plan_rotation(const std::string &local_path, int inc_number,
                                        const std::string &job_name)
{
    if (local_path.empty()) return {};
    const Checked escaped = shell_path("local_path", local_path);
    const int top = snapshots_kept(inc_number) - 1;
    const bool named = job_name.empty() || is_job_name(job_name);
    // All of a rotation or nothing: without the copy of 0, the transfer would overwrite it.
    if (!escaped || !named || !fits_command(rotation_command(*escaped, job_name, 0, top))) {
        refused("snapshots", "job_name or local_path");
        return {};
    }
    std::vector<RotationStep> steps;
    for (int number = top; number >= 0; --number) {
        RotationStep step{number, snapshot_path(local_path, job_name, number), "", ""};
        if (number != top) step.to = snapshot_path(local_path, job_name, number + 1);
        if (exists(step.from)) step.command = rotation_command(*escaped, job_name, number, top);
        steps.push_back(step);
    }
    return steps;
}

Refusal rotate(const std::vector<RotationStep> &steps)
{
    for (const RotationStep &step : steps) {
        DebugLog("[%s]\n", step.from.c_str());
        if (step.command.empty()) continue;
        if (Refusal refusal = run_step(step)) return refusal;
    }
    return {};
}

bool rsync_snapshot_rotate(const std::string &local_path, int inc_number, const std::string &job_name)
{
    const std::vector<RotationStep> steps = plan_rotation(local_path, inc_number, job_name);
    if (!steps.empty()) copy_text(run_options.inc_root_path, steps.back().from);
    return !rotate(steps);
}

} // namespace bakjob
