#include "check/probe.h"

#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "remote/daemon_probe.h"

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

Ended failed(const std::string &why)
{
    Ended ended{{}, -1};
    ended.reply.take(why);
    return ended;
}

Ended run(const Checked &command)
{
    if (!command) return failed(command.refusal().why);
    if (!fits_command(*command)) return failed(refused("probe command", "too long").why);
    ShellReader output(*command);
    if (!output.started()) return failed(NOT_STARTED);
    Ended ended{};
    std::string line;
    while (output.read_line(line)) {
        trim_right(line);
        ended.reply.take(line);
    }
    ended.code = exit_code(output.close());
    return ended;
}

DaemonAnswer reply_of(const Checked &command)
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

LoginAnswer try_login(const RsyncJob &job, SshLogin login)
{
    const Ended ended = run(ssh_test_command(job, login));
    const std::string &line = ended.reply.first();
    const auto result = judge_ssh_reply(line);
    return {result == SSH_OK && ended.code != 0 ? SSH_FAILED : result, line};
}

DaemonAnswer ask_daemon(const RsyncJob &job)
{
    return reply_of(module_list_command(job));
}

DaemonAnswer ask_port(const RsyncJob &job)
{
    const Checked command = module_list_command(job);
    if (!command || refusal_of_port(job.port)) return reply_of(command);
    constexpr std::string_view PROGRAM = "/usr/sbin/rsync";
    return reply_of(std::string(PROGRAM) + " --port=" + job.port + command->substr(PROGRAM.size()));
}

DaemonAnswer look_for_target(const RsyncJob &job)
{
    return reply_of(write_test_command(job, 0));
}

DaemonAnswer try_transfer(const Checked &command)
{
    return reply_of(command ? *command + " --no-recursive --dirs --dry-run 2>&1" : command);
}

} // namespace bakjob::ctl
