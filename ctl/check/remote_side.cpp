// check --probe: what the remote side answers.

#include "check/findings.h"
#include "check/probe.h"
#include "cli/source_folders.h"
#include "common/job_files.h"
#include "common/text.h"
#include "config/current_job.h"
#include "jobs/jobs.h"
#include "output/on_signal.h"
#include "output/words.h"
#include "remote/remote_dir.h"
#include "transfer/backup.h"
#include "transfer/plan.h"

#include <optional>
#include <string_view>
#include <unistd.h>

namespace bakjob::ctl
{

namespace
{

constexpr const char *NO_GREETING = "Change the greeting's first line over there, or take the greeting away.";

// Files of a probe, to be removed however it ends.
char password_path[PATH_SIZE];
char config_path[PATH_SIZE];

void remove_files()
{
    unlink(password_path);
    unlink(config_path);
}

// A job of this process's own, with the values of the one that is looked at: its password file is nobody
// else's, not even a run's that begins meanwhile.
class ProbeJob
{
public:
    explicit ProbeJob(const RsyncJob &job) : job_(job)
    {
        copy_text(job_.job_name, name_.text());
        job_.rsync_pwd_file[0] = '\0';
        if (job_.server_type == SERVER_SAME_KIND)
            copy_text(job_.rsync_user, DEFAULT_USER); // as the transfer does
        job_ = rsync_with_defaults(job_);
        copy_text(password_path, job_.rsync_pwd_file);
        copy_text(config_path, remote_config_copy(name_));
        on_signal_.emplace(remove_files);
        ready_ = !write_password_file(job_) || job.rsync_mode != RSYNC_MODE_DAEMON;
    }
    ProbeJob(const ProbeJob &) = delete;
    ProbeJob &operator=(const ProbeJob &) = delete;
    ~ProbeJob() { remove_files(); }

    [[nodiscard]] bool ready() const { return ready_; }
    [[nodiscard]] const RsyncJob &job() const { return job_; }
    [[nodiscard]] const JobName &name() const { return name_; }

private:
    const JobName name_ = JobName::checked("bakjobctl." + std::to_string(getpid())).value();
    RsyncJob job_;
    std::optional<OnSignal> on_signal_;
    bool ready_ = false;
};

class RemoteCheck
{
public:
    RemoteCheck(const RsyncJob &job, const JobName &name, const ProbeJob &probe, Findings &findings)
        : job_(job), root_(rsync_remote_root(name).value_or("")), probe_(probe), findings_(findings)
    {
    }

    // True when there is more to ask.
    bool login();
    bool daemon();
    bool target();

    void folder(const std::string &folder);

private:
    void add(Verdict verdict, const std::string &about, const std::string &what, const char *todo = "")
    {
        findings_.push_back({verdict, about, what, todo});
    }
    void report(const std::string &about, const Advice &advice, const std::string &line);
    void preparation(const std::string &folder, const std::string &target);
    bool misled(const std::string &folder, const DaemonAnswer &target);

    [[nodiscard]] bool to_module() const { return job_.rsync_mode == RSYNC_MODE_DAEMON; }

    const RsyncJob &job_;
    const std::string root_;
    const ProbeJob &probe_;
    Findings &findings_;
};

void RemoteCheck::report(const std::string &about, const Advice &advice, const std::string &line)
{
    const bool fine = *advice.todo == '\0';
    const std::string answer = fine || line.empty() ? "" : ": " + line;
    add(fine ? Verdict::FINE : Verdict::PROBLEM, about, advice.what + answer, advice.todo);
}

// The login of the transfer itself. Without `use_ssh`, a path on the host is reached by keys alone.
bool RemoteCheck::login()
{
    if (job_.use_ssh != 1 && to_module()) return true;
    const auto kind = job_.use_ssh == 1 ? ssh_login_of(job_) : SshLogin::AS_CLIENT;
    if (!kind) return false; // the values say why
    RsyncJob job = probe_.job();
    if (job.use_ssh != 1) job.ssh_pwd[0] = '\0';
    const LoginAnswer reply = try_login(job, *kind);
    report("ssh login", advice_of_login(reply.result), reply.line);
    return reply.result == SSH_OK;
}

bool RemoteCheck::daemon()
{
    const DaemonAnswer reply = ask_daemon(probe_.job());
    if (reply.result != REPLY_OK) {
        report("rsync daemon", advice_of_reply(reply.result), reply.line);
        return false;
    }
    if (reply.run_sees != REPLY_OK) {
        add(Verdict::PROBLEM, "rsync daemon",
            "answers, but a run takes its greeting for a failure: " + reply.first, NO_GREETING);
        return false;
    }
    add(Verdict::FINE, "rsync daemon", "answers");
    if (std::string_view(job_.port) == DEFAULT_PORT || job_.use_ssh == 1) return true;
    const DaemonAnswer own = ask_port(probe_.job());
    if (own.result == REPLY_OK) return true;
    const std::string port = std::string("port ") + job_.port;
    report(port, {advice_of_reply(own.result).what, "bakjobctl set NAME port=873, or whatever is right."},
           own.line);
    return false;
}

// The module of a push, before its folders: what is missing there is for each of them to say.
bool RemoteCheck::target()
{
    if (!to_module() || job_.backup_type != BACKUP_PUSH) return true;
    const DaemonAnswer reply = look_for_target(probe_.job());
    if (reply.result == REPLY_NO_DIR) return true;
    report("remote_path", advice_of_reply(reply.result), reply.line);
    return reply.result == REPLY_OK;
}

// What a run would do about a folder that is missing at the target of a push to a module.
void RemoteCheck::preparation(const std::string &folder, const std::string &target)
{
    const std::string_view path = job_.remote_path;
    const std::string module(path.substr(0, path.find('/')));
    if (path.find_first_not_of('/', module.size()) != std::string_view::npos) {
        add(Verdict::PROBLEM, folder,
            std::string("is not there yet, and a run makes it only where remote_path is a module alone: ") +
                target,
            "Make this folder there.");
        return;
    }
    const LoginAnswer reply = try_login(probe_.job(), SshLogin::AS_CLIENT);
    const Advice advice = advice_of_login(reply.result);
    if (reply.result != SSH_OK) {
        const bool denied = reply.result == SSH_DENIED;
        add(Verdict::PROBLEM, folder,
            "is not there yet, and the ssh login by which a run makes it " + std::string(advice.what) + ": " +
                reply.line,
            denied ? "Give ssh_pwd the password of root over there, or make the folder there." : advice.todo);
    } else if (!find_module_folder(probe_.job(), probe_.name(), module)) {
        add(Verdict::PROBLEM, folder,
            "is not there yet, and /etc/rsyncd.conf over there has no header \"[ " + module +
                " ]\" with a \"path = \" line, by which a run finds where to make it",
            "Write both so, or make the folder there.");
    } else {
        add(Verdict::FINE, folder, "is not there yet; the run makes it");
    }
}

// Whether a run would act on a folder by what it takes for the truth. It acts on a missing one alone.
bool RemoteCheck::misled(const std::string &folder, const DaemonAnswer &target)
{
    const bool pushes = job_.backup_type == BACKUP_PUSH;
    const bool missing = target.result == REPLY_NO_DIR;
    const bool seen = target.run_sees == REPLY_NO_DIR;
    if (missing == seen || (pushes && !to_module()) || (missing && !pushes)) return false;
    const std::string greeting = ": \"" + target.first + '"';
    if (missing) {
        add(Verdict::PROBLEM, folder,
            "is not there yet, and no run makes it, as the greeting hides that" + greeting,
            "Make this folder there, or take \"motd file\" out of the daemon's configuration.");
    } else {
        add(Verdict::PROBLEM, folder, "a run takes it for missing because of the greeting" + greeting,
            NO_GREETING);
    }
    return true;
}

void RemoteCheck::folder(const std::string &folder)
{
    RsyncJob ended = probe_.job();
    if (enter_share(root_, folder) || set_ends(ended, folder)) return; // said by the look at this device
    const DaemonAnswer target = look_for_target(ended);
    const bool pushes = job_.backup_type == BACKUP_PUSH;
    if (misled(folder, target)) return;
    if (target.result == REPLY_NO_DIR && !pushes) {
        report(folder, {"is not there", "A pull fetches what lies in the folder of this name over there."},
               target.line);
    } else if (target.result == REPLY_NO_DIR && to_module()) {
        preparation(folder, ended.remote_path);
    } else {
        DaemonAnswer transfer = try_transfer(planned_command(ended, ended));
        if (transfer.result == REPLY_OK && pushes && !to_module()) {
            // The dry run of a folder does not say that its parent is missing; that of a file does.
            copy_text(ended.local_path, "/etc/hosts");
            transfer = try_transfer(planned_command(ended, ended));
        }
        report(folder, advice_of_reply(transfer.result), transfer.line);
    }
}

} // namespace

void check_remote_side(const RsyncJob &job, Findings &findings)
{
    const auto name = JobName::checked(job.job_name);
    const ProbeJob probe(job);
    if (!name || !probe.ready()) return; // the values say why
    RemoteCheck check(job, *name, probe, findings);
    if (!check.login() || !check.daemon() || !check.target()) return;

    for (const std::string &folder : folders_of(job)) {
        check.folder(folder);
    }
}

} // namespace bakjob::ctl
