#include "cli/process_guard.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/private_file.h"
#include "common/run_options.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"

#include <cerrno>
#include <charconv>
#include <fcntl.h>
#include <fstream>
#include <sys/stat.h>
#include <unistd.h>

namespace bakjob
{

namespace
{

// The file's text becomes the argument of a kill as root: it has to be one process id and nothing else. 0
// when it is not.
pid_t process_id_in(const std::string &path)
{
    const UniqueFd file = open_own_file(path, O_RDONLY);
    char text[32] = "";
    if (!file || read(file.get(), text, sizeof text - 1) <= 0) return 0;
    const std::string_view content(text);
    pid_t pid = 0;
    const auto [end, error] = std::from_chars(content.data(), content.data() + content.size(), pid);
    const bool whole = error == std::errc() && (*end == '\0' || std::string_view(end) == "\n");
    return whole && pid > 0 ? pid : 0;
}

// By its command line: "bakjob", perhaps with a path or behind an emulator, and the name, perhaps joined to
// its option.
bool runs_job(pid_t pid, std::string_view job_name)
{
    std::ifstream file(format_text("/proc/%d/cmdline", pid), std::ios::binary);
    bool is_bakjob = false;
    bool is_named = false;
    for (std::string word; std::getline(file, word, '\0');) {
        is_bakjob |= std::string_view(word).substr(word.rfind('/') + 1) == "bakjob";
        is_named |= word.ends_with(job_name);
    }
    return is_bakjob && is_named;
}

} // namespace

bool rsync_pid_file_absent(const JobName &job)
{
    struct stat status = {};
    return lstat(pid_file(job).c_str(), &status) != 0;
}

bool rsync_write_pid_file(const JobName &job)
{
    const std::string path = pid_file(job);
    const UniqueFd file = create_file(path, 0644);
    if (!file) return false;
    if (write_all(file.get(), format_text("%d\n", getpid()))) return true;
    const int why = errno;
    unlink(path.c_str());
    errno = why;
    return false;
}

pid_t rsync_running_process(const JobName &job)
{
    const pid_t pid = process_id_in(pid_file(job));
    return pid > 0 && runs_job(pid, job.text()) ? pid : 0;
}

int rsync_remove_pid_file(const JobName &job)
{
    return unlink(pid_file(job).c_str());
}

std::string rsync_ps_command()
{
    return run_shell("ps -ww >/dev/null 2>&1") == 0 ? "ps -ww" : "ps";
}

int rsync_kill_job_process(const JobName &job)
{
    if (rsync_pid_file_absent(job)) return -1;
    const std::string path = pid_file(job);
    if (process_id_in(path) == 0) {
        DebugLog("ERROR: no process id in [%s]\n", path.c_str());
        return -1;
    }
    const std::string ps = rsync_ps_command();
    const std::string file = in_backquotes(escape_path(path));
    const std::string is_restore =
        format_text("%s | grep `cat %s`'' | grep -- ' -i ' | grep -v '%s'  >/dev/null 2>&1", ps.c_str(),
                    file.c_str(), ps.c_str());
    if (run_shell(is_restore) == 0) run_options.restore_mode = 1;
    return run_shell(format_text("kill -9 `cat %s`", file.c_str()));
}

void rsync_kill_transfers(const JobName &job)
{
    const std::string ps = rsync_ps_command();
    run_shell(format_text("kill -9 `%s | grep /usr/sbin/rsync | grep job-name=%s | grep -v '%s' "
                          "| awk '{ print $1 }'`  >/dev/null 2>&1",
                          ps.c_str(), in_backquotes(grep_word(job.text())).c_str(), ps.c_str()));
}

} // namespace bakjob
