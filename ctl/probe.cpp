#include "probe.h"

#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/current_job.h"
#include "remote/daemon_test.h"
#include "transfer/backup.h"

namespace bakjob::ctl
{

namespace
{

// rsync's exit code for a folder that is not there. Its message can get lost on the way from the far end.
constexpr int NO_SUCH_FOLDER = 3;

struct Ended {
    std::string line; // the first one of the output
    int code;         // 0: well
};

Ended run(const std::optional<std::string> &command)
{
    if (!command || !fits_command(*command)) return {"a value is refused", -1};
    ShellReader output(*command);
    if (!output.started()) return {"the command could not be started", -1};
    Ended ended{};
    std::string line;
    for (bool first = true; output.read_line(line); first = false) {
        if (first) ended.line = line;
    }
    trim_right(ended.line);
    ended.code = exit_code(output.close());
    return ended;
}

DaemonReply reply_of(const std::optional<std::string> &command)
{
    const Ended ended = run(command);
    const RemoteReplyCode code = classify_reply_line(ended.line);
    if (code != REPLY_OK || ended.code == 0) return {code, ended.line};
    return {ended.code == NO_SUCH_FOLDER ? REPLY_NO_DIR : REPLY_ERROR, ended.line};
}

} // namespace

LoginReply try_login(SshLogin login)
{
    const Ended ended = run(ssh_test_command(CurrentJob, login));
    const auto result = judge_ssh_reply(ended.line);
    return {result == SSH_OK && ended.code != 0 ? SSH_FAILED : result, ended.line};
}

DaemonReply ask_daemon()
{
    return reply_of(module_list_command(CurrentJob));
}

DaemonReply ask_port()
{
    auto command = module_list_command(CurrentJob);
    constexpr std::string_view PROGRAM = "/usr/sbin/rsync";
    if (command && is_safe_port(CurrentJob.port)) {
        command->insert(PROGRAM.size(), std::string(" --port=") + CurrentJob.port);
    }
    return reply_of(command);
}

DaemonReply look_for_target()
{
    return reply_of(write_test_command(CurrentJob, 0));
}

DaemonReply try_transfer(const RsyncJob &job)
{
    const auto command = rsync_transfer_command(job);
    if (!command) return {REPLY_ERROR, "a value is refused"};
    return reply_of(*command + " --no-recursive --dirs --dry-run 2>&1");
}

} // namespace bakjob::ctl
