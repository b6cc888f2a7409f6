#include "remote/daemon_config.h"

#include "common/debug_log.h"
#include "common/interrupt.h"
#include "common/private_file.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "remote/ssh_login.h"

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

namespace bakjob
{

namespace
{

constexpr std::string_view PATH_KEY = "path = ";
constexpr int MAX_TESTS = 10;
constexpr off_t MAX_BYTES = off_t{1024} * 1024; // of a configuration: the remote side may never end it

// Size of the file behind a handle; 0 when that is no plain file.
off_t file_size(int fd)
{
    struct stat status = {};
    return fstat(fd, &status) == 0 && S_ISREG(status.st_mode) ? status.st_size : 0;
}

// While this lives, a command that makes a file larger than so many bytes is ended by the kernel, without a
// memory image, which would hold the password. A log that its messages go to may be longer already.
class FileSizeLimit
{
public:
    FileSizeLimit()
    {
        lower(RLIMIT_FSIZE, size_, MAX_BYTES + std::max(file_size(STDOUT_FILENO), file_size(STDERR_FILENO)));
        lower(RLIMIT_CORE, core_, 0);
        struct sigaction action = {};
        action.sa_handler = SIG_DFL; // as the command inherits it
        sigaction(SIGXFSZ, &action, &signal_);
    }
    FileSizeLimit(const FileSizeLimit &) = delete;
    FileSizeLimit &operator=(const FileSizeLimit &) = delete;
    ~FileSizeLimit()
    {
        sigaction(SIGXFSZ, &signal_, nullptr);
        setrlimit(RLIMIT_FSIZE, &size_);
        setrlimit(RLIMIT_CORE, &core_);
    }

private:
    static void lower(decltype(RLIMIT_FSIZE) what, rlimit &before, off_t limit)
    {
        getrlimit(what, &before);
        const rlimit now{.rlim_cur = std::min(before.rlim_cur, static_cast<rlim_t>(limit)),
                         .rlim_max = before.rlim_max};
        setrlimit(what, &now);
    }

    rlimit size_ = {};
    rlimit core_ = {};
    struct sigaction signal_ = {};
};

// Of a copy that is as large as it could become, which is removed.
Refusal refusal_of_size(const std::string &local_copy)
{
    struct stat status = {};
    if (lstat(local_copy.c_str(), &status) != 0 || status.st_size < MAX_BYTES) return {};
    Refusal refusal = refused('[' + local_copy + ']', "larger than 1 MiB");
    std::remove(local_copy.c_str());
    return refusal;
}

void wait_a_second()
{
    sleep(1);
    throw_if_interrupted();
}

bool wait_for_file(const std::string &path)
{
    wait_a_second();
    for (int test = 0; test < MAX_TESTS; ++test) {
        if (access(path.c_str(), F_OK) == 0) return true;
        wait_a_second();
    }
    return false;
}

} // namespace

std::string not_fetched(int exit_code)
{
    return format_text("/etc/rsyncd.conf over there was not fetched: exit code %d", exit_code);
}

std::optional<std::string> section_name(std::string_view line)
{
    constexpr std::size_t NAME_STARTS = 2;
    if (!contains(line, "[") || contains(line, PATH_KEY)) return std::nullopt;
    // The closing bracket may be in the part that was cut off.
    if (line.size() == LINE_LENGTH) return std::string(line.substr(NAME_STARTS));
    const std::size_t bracket = line.rfind(']');
    if (bracket == std::string_view::npos || bracket < NAME_STARTS + 1) return std::nullopt;
    return std::string(line.substr(NAME_STARTS, bracket - 1 - NAME_STARTS));
}

std::optional<std::string> path_of_line(std::string_view line)
{
    if (!contains(line, PATH_KEY)) return std::nullopt;
    return std::string(line.substr(PATH_KEY.size()));
}

bool read_daemon_config(const std::string &local_copy, const std::function<bool(const std::string &)> &line)
{
    UniqueFd opened = open_own_file(local_copy, O_RDONLY);
    const UniqueFile file(opened ? fdopen(opened.get(), "r") : nullptr);
    if (!file) return false;
    opened.release();
    std::string text;
    while (read_line(file.get(), text)) {
        trim_right(text);
        if (!line(text)) break;
    }
    return true;
}

FetchedConfig fetch_daemon_config(const RsyncJob &job, const std::string &local_copy)
{
    const Checked word = shell_path("local copy", local_copy);
    if (!word) return {-1, word.refusal()};
    const Checked command = ssh_command(job, SshLogin::AS_CLIENT, "cat /etc/rsyncd.conf > " + *word);
    if (!command) return {-1, command.refusal()};
    // The shell would write through a link of that name: with a file of ours in place nobody else can put
    // one.
    if (!replace_file(local_copy, 0600, "")) {
        return {-1, trace_refusal('[' + local_copy + "]: " + std::strerror(errno))};
    }
    DebugLog("[%s]\n", command->c_str());
    int code = 0;
    {
        const FileSizeLimit limit;
        code = exit_code(run_shell(*command));
    }
    if (Refusal refusal = refusal_of_size(local_copy)) return {code, refusal};
    if (!wait_for_file(local_copy)) return {code, trace_refusal('[' + local_copy + "] has gone")};
    if (code != 0) trace_refusal(not_fetched(code));
    return {code, {}};
}

} // namespace bakjob
