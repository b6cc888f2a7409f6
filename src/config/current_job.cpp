#include "config/current_job.h"

#include "common/job_files.h"
#include "common/text.h"

namespace bakjob
{

RsyncJob CurrentJob{};

char share_remote_dir[PATH_SIZE];
char share_path[PATH_SIZE];
char share_subdir[PATH_SIZE];

RsyncJob rsync_with_defaults(const RsyncJob &job)
{
    RsyncJob filled = job;
    const auto name = JobName::checked(job.job_name);
    if (filled.rsync_pwd_file[0] == '\0' && name) copy_text(filled.rsync_pwd_file, password_file(*name));
    if (filled.rsync_user[0] == '\0') copy_text(filled.rsync_user, DEFAULT_USER);
    if (filled.rsync_pwd[0] == '\0') {
        copy_text(filled.rsync_pwd, DEFAULT_DAEMON_PASSWORD);
        filled.pwd_encoded = 0;
    }
    if (filled.port[0] == '\0') copy_text(filled.port, DEFAULT_PORT);
    if (filled.inc_enable != 0) filled.inc_number = snapshots_kept(filled.inc_number);
    return filled;
}

void rsync_prepare_current_job(RsyncJob &job)
{
    rsync_copy_job(CurrentJob, rsync_with_defaults(job));
    copy_text(job.rsync_pwd_file, CurrentJob.rsync_pwd_file);
}

} // namespace bakjob
