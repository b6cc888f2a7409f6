// check: what stands at the names that a run uses in a job's folders, and what a run would bring there.

#include "check/findings.h"
#include "common/job_files.h"
#include "common/private_file.h"
#include "common/text.h"
#include "jobs/jobs.h"
#include "transfer/row_guard.h"
#include "transfer/snapshot_mark.h"

#include <sys/statvfs.h>
#include <unistd.h>

namespace bakjob::ctl
{

namespace
{

void check_link(const RsyncJob &job, const std::string &folder, Findings &findings)
{
    if (why_no_folder(folder) != "is a link") return;
    findings.push_back({Verdict::NOTE, folder,
                        job.backup_type == BACKUP_PUSH
                            ? "it is a link: a run sends the link, not what is behind it"
                            : "it is a link: what a run fetches lands behind it",
                        "bakjobctl set NAME local_path=FOLDER with the folder's own name"});
}

void check_row(const RsyncJob &job, Findings &findings)
{
    for (const std::string &path : snapshots_in_use(job)) {
        const std::string why = why_no_folder(path);
        if (why.empty()) continue;
        findings.push_back({Verdict::PROBLEM, path, "it " + why + ", so nothing is fetched",
                            "Find out who put it there, and take it away."});
    }
}

void check_marks(const RsyncJob &job, Findings &findings)
{
    std::string unknown;
    for (int number = 0; number < MAX_SNAPSHOTS; ++number) {
        const std::string path = snapshot_path(job.local_path, job.job_name, number);
        if (!is_directory(path) || is_marked_whole(path)) continue;
        unknown += (unknown.empty() ? "" : ", ") + snapshot_name(job.job_name, number);
    }
    if (!unknown.empty()) {
        findings.push_back({Verdict::NOTE, job.local_path, "not known to be complete: " + unknown,
                            "Compare one with its source before you recover it: what it lacks is deleted at "
                            "the remote side."});
    }
    if (is_directory(job.local_path) && !keeps_marks(job.local_path)) {
        findings.push_back({Verdict::NOTE, job.local_path,
                            "its file system keeps no extended attributes, so no snapshot can be known to be "
                            "complete",
                            ""});
    }
}

void check_mount(const RsyncJob &job, Findings &findings)
{
    struct statvfs status = {};
    constexpr unsigned long SAFE = ST_NOSUID | ST_NODEV;
    if (statvfs(job.local_path, &status) != 0 || (status.f_flag & SAFE) == SAFE) return;
    findings.push_back({Verdict::NOTE, job.local_path,
                        "a run may bring setuid programs and device files, and its volume lets them act",
                        "Mount it with nosuid,nodev, unless you trust the remote side like this device."});
}

} // namespace

void check_local_copies(const RsyncJob &job, Findings &findings)
{
    for (const std::string &folder : folders_of(job)) {
        RsyncJob part = job;
        if (!copy_text(part.local_path, folder)) continue;
        check_link(part, folder, findings);
        if (job.backup_type == BACKUP_PUSH) continue;
        check_row(part, findings);
        if (keeps_snapshots(part)) check_marks(part, findings);
        check_mount(part, findings);
    }
}

} // namespace bakjob::ctl
