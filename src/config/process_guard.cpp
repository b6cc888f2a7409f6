#include "config/process_guard.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/private_file.h"
#include "common/run_options.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <fstream>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

namespace bakjob
{

namespace
{

constexpr const char *PID_FOLDER = "/var/run"; // of pid_file
constexpr mode_t PID_FILE_MODE = 0644;

// The file's text becomes the argument of a kill as root: it has to be one process id and nothing else. 0
// when it is not.
pid_t process_id_in(int file)
{
    char text[32] = "";
    const ssize_t length = pread(file, text, sizeof text, 0);
    if (length <= 0 || length == sizeof text) return 0;
    std::string_view content(text, static_cast<std::size_t>(length));
    if (content.ends_with('\n')) content.remove_suffix(1);
    return std::max(whole_number<pid_t>(content).value_or(0), 0);
}

// Whoever removes a pid file locks it first, so that no other file takes its place between the check and the
// removal. Every user can read the file, and so lock it: the wait is short.
void lock_briefly(int file)
{
    for (int i = 0; i < 100 && flock(file, LOCK_EX | LOCK_NB) != 0 && errno == EWOULDBLOCK; ++i) {
        usleep(10'000);
    }
}

// The whole file at once; no handle (errno) where the file system cannot do that.
UniqueFd link_pid_file(const std::string &path, std::string_view text)
{
    UniqueFd file(open(PID_FOLDER, O_TMPFILE | O_WRONLY | O_CLOEXEC, PID_FILE_MODE));
    if (!file || fchmod(file.get(), PID_FILE_MODE) != 0 || !write_all(file.get(), text)) return UniqueFd();
    const std::string handle = format_text("/proc/self/fd/%d", file.get());
    if (linkat(AT_FDCWD, handle.c_str(), AT_FDCWD, path.c_str(), AT_SYMLINK_FOLLOW) == 0) return file;
    return UniqueFd();
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
        const std::string_view option =
            std::string_view(word).substr(0, word.size() - std::min(word.size(), job_name.size()));
        const bool joined = option.starts_with('-') && option.ends_with('r');
        is_named |= word.ends_with(job_name) && (option.empty() || joined);
    }
    return is_bakjob && is_named;
}

// Of the process that the pid file names; `file` is a word of a command in backquotes.
bool is_of_restore_run(const std::string &ps, const std::string &file)
{
    return run_shell(format_text("%s | grep `cat %s`'' | grep -- ' -i ' | grep -v '%s'  >/dev/null 2>&1",
                                 ps.c_str(), file.c_str(), ps.c_str())) == 0;
}

} // namespace

bool rsync_pid_file_absent(const JobName &job)
{
    struct stat status = {};
    return lstat(pid_file(job).c_str(), &status) != 0;
}

PidFile rsync_write_pid_file(const JobName &job)
{
    PidFile made{pid_file(job), UniqueFd(), getpid(), true};
    const std::string text = format_text("%d\n", made.process);
    made.handle = link_pid_file(made.path, text);
    if (made.handle || errno == EEXIST) return made;
    made.handle = create_file(made.path, PID_FILE_MODE);
    if (!made.handle || write_all(made.handle.get(), text)) return made;
    const int why = errno;
    unlink(made.path.c_str());
    made.handle.reset();
    errno = why;
    return made;
}

PidFile rsync_read_pid_file(const JobName &job)
{
    PidFile read{pid_file(job), UniqueFd(), 0, false};
    read.handle = open_own_file(read.path, O_RDONLY);
    if (read.handle) {
        read.process = process_id_in(read.handle.get());
        read.is_run = read.process > 0 && runs_job(read.process, job.text());
    } else {
        read.handle = UniqueFd(open(read.path.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC)); // of any type
    }
    return read;
}

pid_t rsync_running_process(const JobName &job)
{
    const PidFile file = rsync_read_pid_file(job);
    return file.is_run ? file.process : 0;
}

int rsync_remove_pid_file(const PidFile &file) noexcept
{
    if (!file.handle) return -1;
    lock_briefly(file.handle.get());
    return is_at(file.path, file.handle.get()) ? unlink(file.path.c_str()) : -1;
}

std::string rsync_ps_command()
{
    return run_shell("ps -ww >/dev/null 2>&1") == 0 ? "ps -ww" : "ps";
}

int rsync_kill_job_process(const JobName &job)
{
    if (rsync_pid_file_absent(job)) return -1;
    const std::string path = pid_file(job);
    const pid_t process = rsync_read_pid_file(job).process;
    if (process == 0 || process == getpid()) {
        DebugLog("ERROR: no process id in [%s]\n", path.c_str());
        return -1;
    }
    const std::string ps = rsync_ps_command();
    const std::string file = in_backquotes(escape_path(path));
    if (is_of_restore_run(ps, file)) run_options.restore_mode = 1;
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
