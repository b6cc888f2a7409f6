// What a neighbour places at our names, and what he reads, at whatever moment.

#include "common/debug_log.h"
#include "common/run_options.h"
#include "common/text.h"
#include "config/current_job.h"
#include "remote/discovery.h"
#include "soak_support.h"

#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

// A process that writes at all of our names: the trace file and the discovery's copy, which a run does not,
// and then those of a run.
pid_t use_all_names(bool discover)
{
    const pid_t run = fork();
    if (run != 0) return run;
    run_options.debug_mode = 2;
    DebugLog("traced\n");
    CurrentJob = make_job("daily");
    CurrentJob.server_type = 1;
    copy_text(CurrentJob.remote_ip, "127.0.0.1");
    if (discover) rsync_discover_remote();
    execl("/usr/sbin/bakjob", "bakjob", "-r", "daily", nullptr);
    _exit(127);
}

} // namespace

TEST_F(Holds, WhatSomebodyPlacedIsNeitherReadNorChanged)
{
    const std::vector<std::string> names = {"/tmp/r_daily.passwd",
                                            "/tmp/r_daily",
                                            "/tmp/r_daily.dump_size",
                                            "/tmp/rsync_write_conf.lock",
                                            "/tmp/rsync_bakcup_src_folder_name.daily",
                                            "/tmp/remote_rshareinfo_daily.txt",
                                            "/tmp/remote_rinfo.txt",
                                            "/tmp/rsync_debug",
                                            PID_FILE,
                                            CRON};
    const Keys traps = {{"link", "ln -s /tmp/victim "},
                        {"dangling link", "ln -s /tmp/made "},
                        {"second name", "ln /tmp/victim "},
                        {"pipe", "mkfifo "},
                        {"folder", "mkdir "}};
    int tries = 0;
    int failures = 0;
    for (const std::string &name : names) {
        for (const auto &[kind, command] : traps) {
            if (soak_table() == nullptr && (name.size() + kind.size()) % 8 != 0) continue;
            SetUp();
            fs::remove_all("/remote/backup/S1_remote_backup");
            add_job({{"ssh_pwd", "cm9vdHB3"}});
            write_file("/tmp/victim", "kept");
            fs::permissions("/tmp/victim", fs::perms(0644));
            shell("rm -rf " + name + " /tmp/made; " + command + name);
            const pid_t run = use_all_names(name == "/tmp/remote_rinfo.txt");
            const bool ends = eventually([&] { return waitpid(run, nullptr, WNOHANG) != 0; }, 30);
            if (!ends) kill(run, SIGKILL);
            shell("rm -rf " + name);
            ++tries;
            const std::string victim = read_file("/tmp/victim") + octal_mode("/tmp/victim");
            if (ends && victim == "kept644" && !exists("/tmp/made")) continue;
            ++failures;
            ADD_FAILURE() << name << " " << kind;
        }
    }
    expect_none_of(tries, failures, "links and files placed at our names: untouched");
}

TEST_F(Holds, NobodyElseCanEverReadThePassword)
{
    add_job({});
    umask(0);
    const pid_t thief = fork();
    if (thief == 0) {
        become_neighbour();
        while (open("/tmp/r_daily.passwd", O_RDONLY) < 0) {
        }
        _exit(2);
    }
    const int tries = rounds(4, 100);
    for (int i = 0; i < tries; ++i)
        wait_for(start({"-r", "daily"}));
    umask(022);
    kill(thief, SIGKILL);
    expect_none_of(tries, wait_for(thief) == 128 + SIGKILL ? 0 : 1,
                   "runs beside a reader of passwords: nothing read");
}
