#include "cli/source_folders.h"
#include "common/folder_table.h"
#include "common/shell.h"
#include "common/text.h"
#include "config/current_job.h"
#include "findings.h"
#include "remote/daemon_test.h"
#include "remote/remote_dir.h"
#include "remote/ssh_login.h"
#include "transfer/backup.h"
#include "words.h"

#include <algorithm>
#include <optional>
#include <unistd.h>

namespace bakjob::ctl
{

namespace
{

struct Answer {
    RemoteReplyCode code;
    std::string line;
};

// Replies that name no known failure pass for success in a run, which then fails in its transfer.
RemoteReplyCode judge(std::string_view line)
{
    const RemoteReplyCode code = classify_reply_line(line);
    const bool unknown = line.starts_with("rsync:") || line.starts_with("rsync error") ||
                         line.starts_with("ssh:") || contains(line, "Permission denied") ||
                         contains(line, "verification failed");
    return code == REPLY_OK && unknown ? REPLY_ERROR : code;
}

Answer ask(const std::optional<std::string> &command)
{
    if (!command || !fits_command(*command)) return {REPLY_ERROR, "a value is refused"};
    const auto line = first_reply_line(*command);
    if (!line) return {REPLY_ERROR, "the command could not be started"};
    return {judge(*line), *line};
}

// A job of this process's own, with the values of the one that is looked at: its password file is nobody
// else's, not even a run's that begins meanwhile.
class ProbeJob
{
public:
    explicit ProbeJob(const RsyncJob &job) : job_(job)
    {
        copy_text(job_.job_name, "bakjobctl." + std::to_string(getpid()));
        job_.rsync_pwd_file[0] = '\0';
        rsync_prepare_current_job(job_);
        ready_ = rsync_write_password_file() || job.rsync_mode != RSYNC_MODE_DAEMON;
    }
    ProbeJob(const ProbeJob &) = delete;
    ProbeJob &operator=(const ProbeJob &) = delete;
    ~ProbeJob() { unlink(CurrentJob.rsync_pwd_file); }

    [[nodiscard]] bool ready() const { return ready_; }
    [[nodiscard]] std::string name() const { return job_.job_name; }

private:
    RsyncJob job_;
    bool ready_ = false;
};

void report(const std::string &about, const Advice &advice, const std::string &line, Findings &findings)
{
    const bool fine = *advice.todo == '\0';
    const std::string answer = fine || line.empty() ? "" : " (" + line + ")";
    findings.push_back({fine ? Verdict::FINE : Verdict::PROBLEM, about, advice.what + answer, advice.todo});
}

bool login_works(SshLogin login, Findings &findings)
{
    const auto command = ssh_command(CurrentJob, login, "ls / 2>&1");
    const auto reply = command ? first_reply_line(*command) : std::nullopt;
    const auto result = reply ? judge_ssh_reply(*reply) : SSH_FAILED;
    const bool as_client = login == SshLogin::as_client;
    report(as_client ? "ssh login without a name" : std::string("ssh login as ") + CurrentJob.ssh_user,
           advice_of_login(result), reply.value_or(""), findings);
    return result == SSH_OK;
}

// What a run would do about a folder that is missing at the target of a push to a module.
void check_preparation(const ProbeJob &probe, const std::string &folder, Findings &findings)
{
    const std::string path = CurrentJob.remote_path;
    const std::string module = path.substr(0, path.find('/'));
    if (!login_works(SshLogin::as_client, findings)) {
        findings.push_back({Verdict::PROBLEM, folder,
                            "is not on the remote side yet, and a run makes it by this login",
                            "Give ssh_pwd the password of the remote root, or make /" + path + " there."});
    } else if (!rsync_find_module_folder(probe.name(), module)) {
        findings.push_back({Verdict::PROBLEM, folder,
                            "is not on the remote side yet, and /etc/rsyncd.conf there has no \"[ " + module +
                                " ]\" with a \"path = \" line that says where",
                            "Make the folder there, or write the module so."});
    } else {
        findings.push_back({Verdict::FINE, folder, "is not on the remote side yet; the run makes it"});
    }
}

void check_folder(const RsyncJob &job, const ProbeJob &probe, const std::string &folder, Findings &findings)
{
    RsyncJob ended = job;
    const bool found = rsync_resolve_folder(rsync_remote_root(job.job_name), folder) == 0;
    if (!found || !copy_text(ended.local_path, folder) || !rsync_set_ends(ended, folder)) return;
    copy_text(CurrentJob.remote_path, ended.remote_path);
    const Answer answer = ask(write_test_command(CurrentJob, 0));
    const bool to_module = job.backup_type == BACKUP_PUSH && job.rsync_mode == RSYNC_MODE_DAEMON;
    if (answer.code == REPLY_NO_DIR && to_module) {
        check_preparation(probe, folder, findings);
    } else if (answer.code == REPLY_NO_DIR && job.backup_type == BACKUP_PULL) {
        report(folder,
               {"is not on the remote side", "A pull fetches what lies there in the folder of this name."},
               answer.line, findings);
    } else if (answer.code == REPLY_NO_DIR) {
        findings.push_back({Verdict::NOTE, folder,
                            std::string("is not on the remote side yet: ") + ended.remote_path,
                            "The run makes the last folder of this path only."});
    } else {
        report(folder + " on the remote side", advice_of_reply(answer.code), answer.line, findings);
    }
}

} // namespace

void check_remote_side(const RsyncJob &job, Findings &findings)
{
    const ProbeJob probe(job);
    const auto login = ssh_login_of(job);
    if (!login || !probe.ready()) return; // the values say why
    if (job.use_ssh == 1 && !login_works(*login, findings)) return;
    const Answer daemon = ask(module_list_command(CurrentJob));
    report("rsync daemon", advice_of_reply(daemon.code), daemon.line, findings);
    if (daemon.code != REPLY_OK) return;

    RsyncJob to_split = job;
    FolderTable folders{};
    rsync_split_folders(to_split, folders);
    for (int i = 0; i < folders.count; ++i) {
        check_folder(job, probe, folders.entries[i], findings);
    }
}

} // namespace bakjob::ctl
