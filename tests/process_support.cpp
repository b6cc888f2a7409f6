#include "process_support.h"

#include "common/shell.h"

#include <csignal>
#include <filesystem>
#include <sys/wait.h>
#include <unistd.h>

namespace fs = std::filesystem;

namespace
{

constexpr const char *COPY = "/usr/local/sbin/cp"; // commands find it first

const std::string HOLD = "setsid sleep 4711 & (sleep 4711 &) ; touch /tmp/there; sleep 4711";

} // namespace

std::vector<Phase> phases()
{
    const char *const rsync = "/usr/sbin/rsync";
    return {
        {"probe", rsync, "case \"$*\" in *::) " + HOLD + " ;; esac\n"},
        {"dry run", rsync, "case \"$*\" in *--job-name=*--dry-run*) " + HOLD + " ;; esac\n"},
        {"transfer", rsync, "case \"$*\" in *--dry-run*|*::) ;; *) " + HOLD + " ;; esac\n"},
        {"retry wait", rsync, "case \"$*\" in *--dry-run*|*::) ;; *) touch /tmp/there; exit 11 ;; esac\n"},
        {"rotation", COPY, HOLD + "\n"},
    };
}

std::string left_processes()
{
    std::string left;
    for (const auto &entry : fs::directory_iterator("/proc")) {
        const std::string folder = entry.path();
        const std::string command = read_file(folder + "/cmdline");
        const std::string environment = '\0' + read_file(folder + "/environ");
        const bool marked = environment.find('\0' + std::string(bakjob::RUN_MARK) + '=') != std::string::npos;
        const bool holds_up = command.find(std::string("sleep\0004711", 10)) == 0;
        if (marked || holds_up) left += entry.path().filename().string() + ' ' + command + '\n';
    }
    return left;
}

pid_t start_until_there(const std::vector<std::string> &arguments)
{
    fs::remove("/tmp/there");
    const pid_t run = start(arguments);
    EXPECT_TRUE(eventually([] { return exists("/tmp/there"); })) << read_file("/tmp/output");
    return run;
}

int status_within(pid_t process, int seconds)
{
    int status = 0;
    if (eventually([&] { return waitpid(process, &status, WNOHANG) == process; }, seconds)) return status;
    kill(process, SIGKILL);
    waitpid(process, nullptr, 0);
    return 0;
}

std::string left_files()
{
    return shell("ls -d /var/run/bakjob_* /tmp/r_*.passwd /tmp/rsync_bakcup* /tmp/remote_rshareinfo* "
                 "2>/dev/null")
        .output;
}

JobToHoldUp::JobToHoldUp(const Keys &keys)
{
    shell(std::string("cp /bin/cp ") + COPY);
    fs::create_directories(std::string(SHARE) + "/daily.0");
    fs::create_directories("/remote/backup/S1_remote_backup/daily/Public");
    Keys all{{"backup_type", "2"}, {"inc_enable", "1"}, {"retry", "3"}, {"retry_interval", "180"}};
    for (const auto &[key, value] : keys)
        all[key] = value;
    add_job(all);
}

JobToHoldUp::~JobToHoldUp()
{
    shell("pkill -9 -f '[s]leep 4711'");
    fs::remove(COPY);
}
