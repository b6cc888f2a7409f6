#include "config/current_job.h"

#include "common/job_files.h"
#include "common/text.h"

namespace bakjob
{

RsyncJob CurrentJob{};

char share_remote_dir[PATH_SIZE];
char share_path[PATH_SIZE];
char share_subdir[PATH_SIZE];

void rsync_prepare_current_job(RsyncJob &job)
{
    const auto name = JobName::checked(job.job_name);
    if (job.rsync_pwd_file[0] == '\0' && name) copy_text(job.rsync_pwd_file, password_file(*name));
    rsync_copy_job(CurrentJob, job);
    if (CurrentJob.rsync_user[0] == '\0') copy_text(CurrentJob.rsync_user, "root");
    if (CurrentJob.rsync_pwd[0] == '\0') {
        copy_text(CurrentJob.rsync_pwd, DEFAULT_DAEMON_PASSWORD);
        CurrentJob.pwd_encoded = 0;
    }
    if (CurrentJob.port[0] == '\0') copy_text(CurrentJob.port, DEFAULT_PORT);
    if (CurrentJob.inc_enable != 0) CurrentJob.inc_number = snapshots_kept(CurrentJob.inc_number);
}

} // namespace bakjob
