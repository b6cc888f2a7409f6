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
    const auto at = [](const std::string &kind, const std::string &script) {
        return KIND_OF_CALL + "[ $kind != " + kind + " ] || { " + script + "; }\n";
    };
    return {
        {"probe", RSYNC, at("list", HOLD)},   {"dry run", RSYNC, at("dry", HOLD)},
        {"transfer", RSYNC, at("run", HOLD)}, {"retry wait", RSYNC, at("run", "touch /tmp/there; exit 11")},
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

void end_waits()
{
    shell("pkill -9 -f '[s]leep 4711'");
}

pid_t start_until_there(const std::vector<std::string> &arguments)
{
    fs::remove("/tmp/there");
    const pid_t run = start(arguments);
    EXPECT_TRUE(eventually([] { return exists("/tmp/there"); })) << read_file("/tmp/output");
    return run;
}

int result_within(pid_t process, int seconds)
{
    const auto ended = [&] {
        siginfo_t info = {};
        waitid(P_PID, static_cast<id_t>(process), &info, WEXITED | WNOHANG | WNOWAIT);
        return info.si_pid == process;
    };
    if (eventually(ended, seconds)) return wait_for(process);
    kill(process, SIGKILL);
    wait_for(process);
    return -1;
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
    fs::create_directories(SHARE + "/daily.0");
    fs::create_directories("/remote/backup/S1_remote_backup/daily/Public");
    Keys all{{"backup_type", "2"}, {"inc_enable", "1"}, {"retry", "3"}, {"retry_interval", "180"}};
    for (const auto &[key, value] : keys)
        all[key] = value;
    add_job(all);
}

JobToHoldUp::~JobToHoldUp()
{
    end_waits();
    fs::remove(COPY);
}

bool next_run_works()
{
    end_waits();
    shell("rm -rf /tmp/r_*.passwd /tmp/rsync_bakcup* " + SHARE + "/daily.*; mkdir " + SHARE + "/daily.0");
    const Fake rsync(RSYNC, "");
    return wait_for(start({"-r", "daily"})) == 0 && job_key(1, "state") == "2" &&
           fs::remove("/tmp/r_daily.passwd") && !exists(PID_FILE);
}
