// Runs that are killed or interrupted, and the bound on probes: nothing goes on behind a run, nothing stands
// in the way of the next one.

#include "common/shell.h"
#include "config/config_lock.h"
#include "config/job_state.h"
#include "config/process_guard.h"
#include "config/unrecorded_state.h"
#include "process_support.h"

#include <csignal>
#include <filesystem>
#include <optional>
#include <sys/resource.h>
#include <sys/wait.h>
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

class Killed : public Processes
{
};

class Interrupt : public Processes
{
};

class ProbeBound : public Processes
{
};

constexpr const char *PID_FILE = "/var/run/bakjob_daily.pid";
constexpr const char *LOCK = "/tmp/rsync_write_conf.lock";

// Before it is the program, it has the test's own handles.
bool waits_for_lock(pid_t process)
{
    return read_file("/proc/" + std::to_string(process) + "/comm") == "bakjob\n" && has_open(process, LOCK);
}

// A run that is held up until there is a file /tmp/go.
const char *const HELD_UP =
    "case \"$*\" in *::) touch /tmp/there; until [ -e /tmp/go ]; do sleep 0.05; done ;; esac\n";

} // namespace

TEST_F(Killed, NothingThatTheRunHasStartedGoesOn)
{
    for (const Phase &phase : phases()) {
        const Fake program(phase.program, phase.script);
        const pid_t run = start_until_there({"-r", "daily"});
        EXPECT_EQ(wait_for(start({"-k", "daily"})), 0);
        EXPECT_EQ(left_processes(), "") << phase.name;
        EXPECT_EQ(wait_for(run), 128 + SIGKILL);
        EXPECT_EQ(read_file("/tmp/output"), "kill rsync job success .....\n");
        EXPECT_EQ(job_key(1, "state"), "11");
        EXPECT_FALSE(exists(PID_FILE));
    }
}

TEST_F(Killed, ADeadRunsCommandsAreFoundByTheirMark)
{
    const Fake program("/usr/sbin/rsync", phases()[0].script);
    const pid_t run = start_until_there({"-r", "daily"});
    kill(run, SIGKILL);
    wait_for(run);
    EXPECT_NE(left_processes(), "");
    EXPECT_TRUE(exists(PID_FILE));
    wait_for(start({"-k", "daily"}));
    EXPECT_EQ(left_processes(), "");
    EXPECT_FALSE(exists(PID_FILE));
}

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
}

TEST_F(Killed, ARunThatStartsMeanwhileKeepsItsPidFile)
{
    for (const char *const before : {"", "junk", "4194304\n"}) {
        const Fake rsync("/usr/sbin/rsync", HELD_UP);
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
        EXPECT_EQ(WEXITSTATUS(status_within(start({"-r", "daily"}), 10)), 255) << "beside another";
        write_file("/tmp/go", "");
        EXPECT_EQ(wait_for(run), 0);
        EXPECT_EQ(job_key(1, "state"), "2");
        EXPECT_FALSE(exists(PID_FILE));
    }
}

TEST_F(Killed, ARunRemovesOnlyItsOwnPidFile)
{
    const Fake rsync("/usr/sbin/rsync", HELD_UP);
    const pid_t run = start_until_there({"-r", "daily"});
    fs::remove(PID_FILE);
    write_file(PID_FILE, "1\n");
    write_file("/tmp/go", "");
    EXPECT_EQ(wait_for(run), 0);
    EXPECT_EQ(read_file(PID_FILE), "1\n");
    for (const char *const left : {"junk", "", "4194304\n"}) {
        write_file(PID_FILE, left);
        wait_for(start({"-k", "daily"}));
        EXPECT_FALSE(exists(PID_FILE)) << left;
    }
}

TEST_F(Interrupt, EndsTheRunInOrder)
{
    for (const Phase &phase : phases()) {
        for (const int number : {SIGHUP, SIGINT, SIGTERM}) {
            {
                const Fake program(phase.program, phase.script);
                const pid_t run = start_until_there({"-d", "-r", "daily", "-r", "daily"});
                kill(run, number);
                const int status = status_within(run, 10);
                EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == number) << status;
            }
            EXPECT_EQ(left_processes(), "") << phase.name;
            EXPECT_EQ(left_files(), "") << phase.name;
            EXPECT_EQ(job_key(1, "state"), "8");
            EXPECT_EQ(lines_of(read_file("/tmp/output")).back(),
                      "ERROR: interrupted by signal " + std::to_string(number));
            EXPECT_EQ(alerts().size(), 0U);
            const Fake rsync("/usr/sbin/rsync", "");
            EXPECT_EQ(wait_for(start({"-r", "daily"})), 0);
            EXPECT_EQ(job_key(1, "state"), "2") << phase.name;
            fs::remove("/var/log/device_alerts");
            fs::create_directories(std::string(SHARE) + "/daily.0");
            shell("rm -f /tmp/r_*.passwd /tmp/rsync_bakcup*");
        }
    }
}

TEST_F(Interrupt, ACommandThatDoesNotObeyIsKilled)
{
    const Fake rsync("/usr/sbin/rsync", "trap '' TERM HUP INT; touch /tmp/there; sleep 4711; sleep 4711\n");
    const pid_t run = start_until_there({"-i", "x", "-r", "daily"});
    kill(run, SIGTERM);
    const int status = status_within(run, 20);
    EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGTERM) << status;
    EXPECT_EQ(left_processes(), "");
    EXPECT_EQ(job_key(1, "rstate") + job_key(1, "state"), "80") << "of a restore run";
}

TEST_F(Interrupt, TheTerminalsGoesToTheRunAndItsCommands)
{
    const Fake rsync("/usr/sbin/rsync", "touch /tmp/there; exec sleep 4711\n");
    fs::remove("/tmp/there");
    const pid_t run = fork();
    if (run == 0) {
        setpgid(0, 0);
        execl("/usr/sbin/bakjob", "bakjob", "-r", "daily", nullptr);
    }
    ASSERT_TRUE(eventually([] { return exists("/tmp/there"); }));
    kill(-run, SIGINT);
    const int status = status_within(run, 10);
    EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGINT) << status;
    EXPECT_EQ(job_key(1, "state"), "8");
    EXPECT_EQ(left_processes() + left_files(), "");
}

TEST_F(Interrupt, WhatWasIgnoredStaysIgnored)
{
    const Fake rsync("/usr/sbin/rsync", HELD_UP);
    std::signal(SIGHUP, SIG_IGN);
    const pid_t run = start_until_there({"-r", "daily"});
    std::signal(SIGHUP, SIG_DFL);
    kill(run, SIGHUP);
    shell("pkill -HUP -f '[b]ash.*rsync'");
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
    const int status = status_within(run, 15);
    EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGTERM) << status;
    EXPECT_FALSE(exists(PID_FILE));
    const auto kept = rsync_unrecorded_state(named("daily"), StateKind::BACKUP);
    ASSERT_TRUE(kept);
    EXPECT_EQ(kept->state, JOB_INTERRUPTED);
}

TEST_F(Interrupt, AFileSizeLimitIsAFailedWrite)
{
    const pid_t run = fork();
    if (run == 0) {
        const rlimit limit{.rlim_cur = 100, .rlim_max = 100};
        setrlimit(RLIMIT_FSIZE, &limit);
        execl("/bin/sh", "sh", "-c", "exec /usr/sbin/bakjob -k daily 2>/tmp/output", nullptr);
    }
    EXPECT_EQ(wait_for(run), 0);
    EXPECT_NE(read_file("/tmp/output").find("config store: cannot write"), std::string::npos);
    std::signal(SIGXFSZ, SIG_IGN);
    EXPECT_EQ(first_line("ulimit -f 0; sh -c 'echo x >/tmp/x' || echo $?"), "153") << "not of commands";
    std::signal(SIGXFSZ, SIG_DFL);
}

TEST_F(ProbeBound, EndsWhateverGoesOnForEver)
{
    // One byte in a while, and lines without end behind a greeting.
    const BadServer drips(
        [](int c) {
            while (write(c, "x", 1) == 1)
                usleep(200'000);
        },
        8731);
    const BadServer lists(
        [](int c) {
            (void)!write(c, "@RSYNCD: 31.0\n", 14);
            while (write(c, "module\n", 7) == 7)
                usleep(1000);
        },
        8732);
    ASSERT_TRUE(drips.bound() && lists.bound());
    struct Case {
        std::string command;
        int status;
        std::string says;
    };
    const std::string ssh = "/usr/sbin/ssh -d cm9vdHB3 root@127.0.0.1 ";
    const std::vector<Case> cases = {
        {"/usr/sbin/rsync --port=8731 127.0.0.9::", 30, ""},
        {"/usr/sbin/rsync --port=8732 127.0.0.9::", 30, "module"},
        {"/usr/sbin/rsync --job-name=j --port=8731 -a 127.0.0.9::m/ /tmp --dump-size --dry-run", 30, ""},
        {ssh + "'while echo line; do sleep 0.1; done'", 255, "line"},
        {"/usr/sbin/rsync -n -e 'sh -c \"setsid sleep 4711 & sleep 4711\"' x:y /tmp", 30, ""}};
    for (const Case &one : cases) {
        shell(one.command + " >/tmp/unmarked 2>&1 </dev/null & echo $! >/tmp/pid");
        const Ran ran = shell("BAKJOB_RUN=1 DEVICE_PROBE_SECONDS=2 timeout 20 " + one.command + " 2>&1");
        EXPECT_EQ(ran.status, one.status) << one.command;
        EXPECT_EQ(ran.output.substr(0, one.says.size()), one.says);
        EXPECT_EQ(ran.output.find("error"), std::string::npos) << ran.output.substr(0, 300);
        EXPECT_EQ(shell("kill $(cat /tmp/pid)").status, 0) << "nobody's probe: " << one.command;
        shell("pkill -9 -f '[s]leep 4711'");
        EXPECT_TRUE(eventually([] { return left_processes().empty(); })) << left_processes();
    }
}

TEST_F(ProbeBound, OtherwiseChangesNothing)
{
    const std::string marked = "BAKJOB_RUN=1 DEVICE_PROBE_SECONDS=1 ";
    const std::string ssh = marked + "/usr/sbin/ssh -d cm9vdHB3 root@127.0.0.1 ";
    EXPECT_EQ(shell(ssh + "'echo x; exit 7'").status, 7);
    EXPECT_EQ(shell("echo in | " + ssh + "cat").output, "in\n");
    EXPECT_EQ(shell(marked + "/usr/sbin/rsync /no/such/file /tmp 2>/dev/null").status, 23);

    // However it is ended, its caller hears the same, and its stock program goes with it.
    const std::string long_one =
        "BAKJOB_RUN=1 /usr/sbin/rsync -n -e 'sh -c \"cat >/dev/null; :\"' x:y /tmp 2>/dev/null";
    const auto ended_by = [&](const std::string &who, const std::string &number) {
        fs::remove("/tmp/ended");
        shell("{ " + long_one + "; echo $? >/tmp/ended; } >/dev/null 2>&1 &");
        EXPECT_TRUE(eventually([] { return shell("pgrep -x cat").status == 0; }));
        shell("kill -" + number + " $(pgrep -" + who + " -f '^/usr/sbin/rsync .*x:y')");
        EXPECT_TRUE(eventually([] { return exists("/tmp/ended") && left_processes().empty(); }))
            << left_processes();
        return read_file("/tmp/ended");
    };
    EXPECT_EQ(ended_by("n", "KILL"), "137\n") << "the stock program";
    EXPECT_EQ(ended_by("o", "KILL"), "137\n") << "the appliance's";
    EXPECT_EQ(ended_by("o", "TERM"), "20\n") << "passed on";

    // Transfers take as long as they take.
    write_file("/tmp/from/file", std::string(25'000, 'x'));
    for (const std::string end : {"/tmp/to", "root@127.0.0.1:/tmp/to"}) {
        fs::remove("/tmp/to");
        EXPECT_EQ(shell(marked +
                        "/usr/sbin/rsync --job-name=daily --bwlimit=10 -aq8 -e '/usr/sbin/ssh -d cm9vdHB3' "
                        "/tmp/from/file " +
                        end)
                      .status,
                  0);
        EXPECT_EQ(fs::file_size("/tmp/to"), 25'000U);
    }
}
