#include "config/job_list.h"

#include "common/text.h"

#include <new>
#include <utility>

namespace bakjob
{

namespace
{

RsyncJobList the_list{};

// Both passwords become base64 or neither does: `pwd_encoded` speaks for both.
void encode_passwords(RsyncJob &job, bool with_ssh)
{
    char rsync_pwd[PASSWORD_SIZE] = "";
    char ssh_pwd[PASSWORD_SIZE] = "";
    if (password_encode(rsync_pwd, job.rsync_pwd, sizeof rsync_pwd) < 0) return;
    if (with_ssh && password_encode(ssh_pwd, job.ssh_pwd, sizeof ssh_pwd) < 0) return;
    copy_text(job.rsync_pwd, rsync_pwd);
    if (with_ssh) copy_text(job.ssh_pwd, ssh_pwd);
    job.pwd_encoded = 1;
}

void apply_defaults(RsyncJob &job)
{
    const bool arrived_encoded = job.pwd_encoded != 0;
    if (job.rsync_pwd[0] == '\0') {
        copy_text(job.rsync_pwd, DEFAULT_DAEMON_PASSWORD);
        job.pwd_encoded = 0;
    }
    if (job.port[0] == '\0') copy_text(job.port, DEFAULT_PORT);
    if (job.pwd_encoded != 0) job.pwd_encoded = 1;
    // An ssh password that arrived as base64 must not be encoded again with the default.
    if (job.pwd_encoded == 0) encode_passwords(job, job.use_ssh == 1 && !arrived_encoded);
}

} // namespace

RsyncJobList *const job_list = &the_list;

int rsync_job_list_empty()
{
    return job_list->count == 0 ? 1 : 0;
}

RsyncJob *rsync_new_job()
{
    return new (std::nothrow) RsyncJob{};
}

int rsync_list_add_job(RsyncJobList &jobs, const RsyncJob &source)
{
    if (rsync_find_job(jobs, source.job_name) != nullptr) return 0;
    std::unique_ptr<RsyncJob> job(rsync_new_job());
    if (!job) return 0;
    rsync_copy_job(*job, source);
    rsync_list_take_job(jobs, std::move(job));
    return 1;
}

int rsync_list_add_job(const RsyncJob &source)
{
    return rsync_list_add_job(*job_list, source);
}

void rsync_list_take_job(RsyncJobList &jobs, std::unique_ptr<RsyncJob> job)
{
    apply_defaults(*job);
    jobs.append(job.release());
}

RsyncJob *rsync_find_job(const RsyncJobList &jobs, std::string_view job_name)
{
    for (RsyncJob *job = jobs.head; job != nullptr; job = job->next) {
        if (job_name == job->job_name) return job;
    }
    return nullptr;
}

RsyncJob *rsync_find_job(std::string_view job_name)
{
    return rsync_find_job(*job_list, job_name);
}

int rsync_list_remove_job(RsyncJob *job)
{
    return job != nullptr && job_list->remove(job) ? 1 : 0;
}

void rsync_free_jobs()
{
    job_list->clear();
}

} // namespace bakjob
