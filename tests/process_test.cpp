// Runs that are killed or interrupted: nothing goes on behind a run, nothing stands in the way of the next
// one.

#include "common/shell.h"
#include "config/config_lock.h"
#include "config/job_state.h"
#include "config/process_guard.h"
#include "config/unrecorded_state.h"
#include "process_support.h"

#include <csignal>
#include <filesystem>
#include <optional>
#include <unistd.h>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

class Processes : public Holds
{
protected:
    void SetUp() override
    {
        Holds::SetUp();
        job_.emplace();
    }

private:
    std::optional<JobToHoldUp> job_;
};

using Killed = Processes;
using Interrupt = Processes;

constexpr const char *LOCK = "/tmp/rsync_write_conf.lock";

// Before it is the program, it has the test's own handles.
bool waits_for_lock(pid_t process)
{
    return read_file("/proc/" + std::to_string(process) + "/comm") == "bakjob\n" && has_open(process, LOCK);
}

} // namespace

// The pid file names a process that does not run the job; what that one has started is nobody's business
// here, and what a neighbour says about his own processes neither.
TEST_F(Killed, StrangersAreSpared)
{
    const pid_t stranger = fork();
    if (stranger == 0) {
        const std::string mark = run_mark(getpid());
        const std::string script = "exec -a neighbour setpriv --reuid=65534 --clear-groups env " + mark +
                                   " sleep 4711 & env " + mark + " sleep 4711 & wait";
        execl("/bin/bash", "bash", "-c", script.c_str(), nullptr);
    }
    const auto sleeping = [] { return lines_of(shell("pgrep -fx 'sleep 4711'").output).size(); };
    EXPECT_TRUE(eventually([&] { return sleeping() == 2; }));
    write_file(PID_FILE, std::to_string(stranger) + "\n");
    wait_for(start({"-k", "daily"}));
    EXPECT_EQ(wait_for(stranger), 128 + SIGKILL) << "by the id in the file";
    EXPECT_EQ(sleeping(), 2U);
    EXPECT_FALSE(exists(PID_FILE));

    // Now the run is dead: only what is root's is believed.
    write_file(PID_FILE, std::to_string(stranger) + "\n");
    wait_for(start({"-k", "daily"}));
    EXPECT_EQ(shell("pgrep -u 65534 -fxc 'sleep 4711'").output, "1\n");
    EXPECT_EQ(sleeping(), 1U);

    for (const char *const left : {"junk", "", "4194304\n"}) {
        write_file(PID_FILE, left);
        wait_for(start({"-k", "daily"}));
        EXPECT_FALSE(exists(PID_FILE)) << left;
    }
}

TEST_F(Killed, ARunThatStartsMeanwhileKeepsItsPidFile)
{
    for (const char *const before : {"", "junk", "4194304\n"}) {
        const Fake rsync(RSYNC, UNTIL_GO);
        fs::remove("/tmp/go");
        if (*before != '\0') write_file(PID_FILE, before);
        UniqueFd lock = rsync_lock_config(LOCK);
        const pid_t killer = start({"-k", "daily"});
        ASSERT_TRUE(eventually([&] { return waits_for_lock(killer); }));
        // As the end of another killer would leave it.
        fs::remove(PID_FILE);
        const pid_t run = start({"-r", "daily"});
        ASSERT_TRUE(eventually([&] { return waits_for_lock(run); }));
        lock.reset();
        EXPECT_EQ(wait_for(killer), 0);
        EXPECT_EQ(read_file(PID_FILE), std::to_string(run) + "\n") << before;
        EXPECT_EQ(result_within(start({"-r", "daily"}), 10), 255) << "beside another";
        write_file("/tmp/go", "");
        EXPECT_EQ(wait_for(run), 0);
        EXPECT_EQ(job_key(1, "state"), "2");
        EXPECT_FALSE(exists(PID_FILE));
    }
}

TEST_F(Interrupt, EndsTheRunInOrder)
{
    const std::vector<int> signals = {SIGHUP, SIGINT, SIGTERM};
    std::size_t turn = 0;
    for (const Phase &phase : phases()) {
        const int number = signals[turn++ % signals.size()];
        {
            const Fake program(phase.program, phase.script);
            const pid_t run = start_until_there({"-d", "-r", "daily", "-r", "daily"});
            kill(run, number);
            EXPECT_EQ(result_within(run, 10), 128 + number) << phase.name;
        }
        EXPECT_EQ(left_processes() + left_files(), "") << phase.name;
        EXPECT_EQ(job_key(1, "state"), "8");
        EXPECT_EQ(lines_of(read_file("/tmp/output")).back(),
                  "ERROR: interrupted by signal " + std::to_string(number));
        EXPECT_EQ(alerts().size(), 0U);
        EXPECT_TRUE(next_run_works()) << phase.name;
        fs::remove("/var/log/device_alerts");
    }
}

TEST_F(Interrupt, ACommandThatDoesNotObeyIsKilled)
{
    const Fake rsync(RSYNC, "trap '' TERM HUP INT; touch /tmp/there; sleep 4711; sleep 4711\n");
    const pid_t run = start_until_there({"-i", "x", "-r", "daily"});
    kill(run, SIGTERM);
    EXPECT_EQ(result_within(run, 20), 128 + SIGTERM);
    EXPECT_EQ(left_processes(), "");
    EXPECT_EQ(job_key(1, "rstate") + job_key(1, "state"), "80") << "of a restore run";
}

TEST_F(Interrupt, TheTerminalsGoesToTheRunAndItsCommands)
{
    const Fake rsync(RSYNC, "touch /tmp/there; exec sleep 4711\n");
    fs::remove("/tmp/there");
    const pid_t run = fork();
    if (run == 0) {
        setpgid(0, 0);
        execl("/usr/sbin/bakjob", "bakjob", "-r", "daily", nullptr);
    }
    ASSERT_TRUE(eventually([] { return exists("/tmp/there"); }));
    kill(-run, SIGINT);
    EXPECT_EQ(result_within(run, 10), 128 + SIGINT);
    EXPECT_EQ(job_key(1, "state"), "8");
    EXPECT_EQ(left_processes() + left_files(), "");
}

TEST_F(Interrupt, WhatWasIgnoredStaysIgnored)
{
    const Fake rsync(RSYNC, UNTIL_GO);
    std::signal(SIGHUP, SIG_IGN);
    const pid_t run = start_until_there({"-r", "daily"});
    std::signal(SIGHUP, SIG_DFL);
    kill(run, SIGHUP);
    shell("pkill -HUP -f '[s]h /usr/sbin/rsync'");
    write_file("/tmp/go", "");
    EXPECT_EQ(wait_for(run), 0);
    EXPECT_EQ(job_key(1, "state"), "2");
}

// The signal comes while the run waits for the lock, and while it ends somebody holds it still.
TEST_F(Interrupt, ALockThatIsHeldDoesNotKeepTheRun)
{
    const UniqueFd lock = rsync_lock_config(LOCK);
    const pid_t run = start({"-r", "daily"});
    ASSERT_TRUE(eventually([&] { return waits_for_lock(run); }));
    kill(run, SIGTERM);
    EXPECT_EQ(result_within(run, 15), 128 + SIGTERM);
    EXPECT_FALSE(exists(PID_FILE));
    const auto kept = rsync_unrecorded_state(named("daily"), StateKind::BACKUP);
    ASSERT_TRUE(kept);
    EXPECT_EQ(kept->state, JOB_INTERRUPTED);
}
