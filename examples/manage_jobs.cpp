// Manages backup jobs through the installed module:
//
//   manage_jobs HOST SHARE SSH_PASSWORD
//
// lists the jobs, adds one that fetches HOST's module "backup" into SHARE, reads it back, asks what the
// remote side offers, and deletes the job again. SSH_PASSWORD is base64 text.

#include <bakjob/common/fixed_text.h>
#include <bakjob/common/job_files.h>
#include <bakjob/config/config_lock.h>
#include <bakjob/config/current_job.h>
#include <bakjob/config/job_list.h>
#include <bakjob/config/job_operations.h>
#include <bakjob/config/job_store.h>
#include <bakjob/config/remote_modules.h>
#include <bakjob/remote/discovery.h>

#include <cstdio>

using namespace bakjob;

namespace
{

void list_jobs()
{
    {
        const UniqueFd lock = rsync_lock_config(CONFIG_LOCK_FILE);
        rsync_load_jobs();
    }
    std::printf("%d jobs\n", job_list->count);
    for (const RsyncJob *job = job_list->head; job != nullptr; job = job->next) {
        std::printf("  %s: %s -> %s::%s\n", job->job_name, job->local_path, job->remote_ip, job->remote_path);
    }
    rsync_free_jobs();
}

// False when one of the texts does not fit its field.
bool describe(RsyncJob &job, const char *host, const char *share, const char *ssh_password)
{
    job.enable = 1;
    job.server_type = SERVER_SAME_KIND;
    job.backup_type = BACKUP_PULL;
    job.rsync_mode = RSYNC_MODE_DAEMON;
    job.schedule_mode = SCHEDULE_TIMETABLE;
    return copy_text(job.job_name, "example") && copy_text(job.remote_ip, host) &&
           copy_text(job.remote_path, "backup") && copy_text(job.local_path, share) &&
           copy_text(job.ssh_pwd, ssh_password);
}

void show_remote_side(RsyncJob job)
{
    rsync_prepare_current_job(job); // what the queries read
    rsync_discover_remote();
    rsync_print_modules();
    std::printf("local folders: %s\n", module_list->local_size);
    std::printf("daemon password %s\n", rsync_check_remote_secret() == REPLY_OK ? "right" : "wrong");
}

} // namespace

int main(int argc, char **argv)
{
    RsyncJob job{};
    if (argc != 4 || !describe(job, argv[1], argv[2], argv[3])) {
        std::fputs("usage: manage_jobs HOST SHARE SSH_PASSWORD\n", stderr);
        return 2;
    }
    if (rsync_add_job(job) == 0) {
        const char *const failure = job_list->load_failure;
        std::fprintf(stderr, "manage_jobs: %s\n", failure ? failure : "there is a job of that name");
        return 1;
    }
    list_jobs();
    RsyncJob stored{};
    const bool read = rsync_get_job(stored, job.job_name) == 1;
    if (read) show_remote_side(stored);
    const bool deleted = rsync_delete_job(job.job_name) == 1;
    list_jobs();
    return read && deleted ? 0 : 1;
}
