#include "probe.h"

#include "common/shell.h"
#include "common/text.h"
#include "config/current_job.h"
#include "remote/daemon_test.h"

namespace bakjob::ctl
{

namespace
{

struct Ended {
    std::string line; // the first one of the output
    bool well;
};

Ended run(const std::optional<std::string> &command)
{
    if (!command || !fits_command(*command)) return {"a value is refused", false};
    ShellReader output(*command);
    if (!output.started()) return {"the command could not be started", false};
    Ended ended{};
    std::string line;
    for (bool first = true; output.read_line(line); first = false) {
        if (first) ended.line = line;
    }
    trim_right(ended.line);
    ended.well = output.close() == 0;
    return ended;
}

DaemonReply reply_of(const std::optional<std::string> &command)
{
    const Ended ended = run(command);
    const RemoteReplyCode code = classify_reply_line(ended.line);
    return {code == REPLY_OK && !ended.well ? REPLY_ERROR : code, ended.line};
}

} // namespace

LoginReply try_login(SshLogin login)
{
    const Ended ended = run(ssh_test_command(CurrentJob, login));
    const auto result = judge_ssh_reply(ended.line);
    return {result == SSH_OK && !ended.well ? SSH_FAILED : result, ended.line};
}

DaemonReply ask_daemon()
{
    return reply_of(module_list_command(CurrentJob));
}

DaemonReply try_transfer()
{
    return reply_of(write_test_command(CurrentJob, 0));
}

} // namespace bakjob::ctl
