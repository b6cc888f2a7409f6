#include "check/probe.h"

#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/current_job.h"
#include "remote/daemon_probe.h"
#include "transfer/backup.h"

#include <algorithm>
#include <array>
#include <string_view>

namespace bakjob::ctl
{

namespace
{

// rsync's exit code for a folder that is not there. Its message can get lost on the way from the far end.
constexpr int NO_SUCH_FOLDER = 3;

// How the lines of the programs themselves begin, unlike those of a greeting.
constexpr std::array<std::string_view, 5> MESSAGES = {"@ERROR", "ERROR", "rsync: ", "rsync error: ", "ssh: "};

bool is_message(std::string_view line)
{
    return std::any_of(MESSAGES.begin(), MESSAGES.end(),
                       [&](std::string_view start) { return line.starts_with(start); });
}

// What a reply says, line by line, without keeping all of it: the far end decides how long it is.
class Reading
{
public:
    void take(const std::string &line)
    {
        if (lines_++ == 0) first_ = line;
        const bool message = is_message(line);
        if (message && message_.empty()) message_ = line;
        if (classify_reply_line(line) == REPLY_OK) return;
        if (message && failure_message_.empty()) failure_message_ = line;
        if (failure_.empty()) failure_ = line;
    }

    [[nodiscard]] const std::string &first() const { return first_; }

    // The line that tells most about a command that failed.
    [[nodiscard]] const std::string &telling() const
    {
        for (const std::string *line : {&failure_message_, &failure_, &message_}) {
            if (!line->empty()) return *line;
        }
        return first_;
    }

private:
    int lines_ = 0;
    std::string first_, message_, failure_, failure_message_;
};

struct Ended {
    Reading reply;
    int code; // 0: well
};

Ended failed(const char *why)
{
    Ended ended{{}, -1};
    ended.reply.take(why);
    return ended;
}

Ended run(const std::optional<std::string> &command)
{
    if (!command || !fits_command(*command)) return failed("a value is refused");
    ShellReader output(*command);
    if (!output.started()) return failed("the command could not be started");
    Ended ended{};
    std::string line;
    while (output.read_line(line)) {
        trim_right(line);
        ended.reply.take(line);
    }
    ended.code = exit_code(output.close());
    return ended;
}

DaemonReply reply_of(const std::optional<std::string> &command)
{
    const Ended ended = run(command);
    const std::string &first = ended.reply.first();
    const RemoteReplyCode run_sees = classify_reply_line(first);
    if (ended.code == 0) return {REPLY_OK, first, run_sees, first};
    const std::string &line = ended.reply.telling();
    RemoteReplyCode result = classify_reply_line(line);
    if (result == REPLY_OK) result = ended.code == NO_SUCH_FOLDER ? REPLY_NO_DIR : REPLY_ERROR;
    return {result, line, run_sees, first};
}

} // namespace

LoginReply try_login(SshLogin login)
{
    const Ended ended = run(ssh_test_command(CurrentJob, login));
    const std::string &line = ended.reply.first();
    const auto result = judge_ssh_reply(line);
    return {result == SSH_OK && ended.code != 0 ? SSH_FAILED : result, line};
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
    if (!command) return reply_of(command);
    return reply_of(*command + " --no-recursive --dirs --dry-run 2>&1");
}

} // namespace bakjob::ctl
