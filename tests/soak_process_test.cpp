// What must hold at whatever moment a run is killed or interrupted, and however runs and kills of a job come
// together; see soak_test.cpp.

#include "process_support.h"

#include <csignal>
#include <filesystem>
#include <random>
#include <string>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace fs = std::filesystem;

namespace
{

constexpr const char *RSYNC = "/usr/sbin/rsync";
constexpr const char *PID_FILE = "/var/run/bakjob_daily.pid";

// Every command takes a moment and leaves something behind that would live on.
const char *const SLOW = "(setsid sleep 4711 >/dev/null 2>&1 &); sleep 0.03\n";

class Moments
{
public:
    void pause(int most_milliseconds)
    {
        usleep(static_cast<useconds_t>(1000 * number(0, most_milliseconds)));
    }
    int number(int from, int to) { return std::uniform_int_distribution(from, to)(random_); }

private:
    std::mt19937 random_{1};
};

bool next_run_works()
{
    shell("pkill -9 -f '[s]leep 4711'; rm -rf /tmp/r_*.passwd /tmp/rsync_bakcup* " + std::string(SHARE) +
          "/daily.*; mkdir " + SHARE + "/daily.0");
    const Fake rsync(RSYNC, "");
    return wait_for(start({"-r", "daily"})) == 0 && job_key(1, "state") == "2" &&
           fs::remove(std::string("/tmp/r_daily.passwd")) && !exists(PID_FILE);
}

} // namespace

TEST_F(Holds, AKillAtAnyMomentLeavesNothing)
{
    const JobToHoldUp job;
    Moments moments;
    const int tries = rounds(20, 100);
    int failures = 0;
    int killed = 0;
    for (int i = 0; i < tries; ++i) {
        std::string left;
        int status = 0;
        {
            const Fake rsync(RSYNC, SLOW);
            const pid_t run = start({"-r", "daily"});
            moments.pause(200);
            wait_for(start({"-k", "daily"}));
            left = left_processes();
            status = wait_for(run);
        }
        const bool was_killed = status == 128 + SIGKILL; // else it had ended, or not begun
        killed += was_killed ? 1 : 0;
        if (was_killed ? !left.empty() || job_key(1, "state") != "11" : status != 0) {
            ++failures;
            ADD_FAILURE() << status << left;
        }
        if (!next_run_works()) ++failures;
    }
    EXPECT_GT(killed, tries / 4);
    expect_none_of(tries, failures, "kill at any moment: nothing goes on, next run works");
}

TEST_F(Holds, ASignalAtAnyMomentEndsTheRunInOrder)
{
    const JobToHoldUp job;
    Moments moments;
    const int tries = rounds(30, 100);
    int failures = 0;
    int interrupted = 0;
    for (int i = 0; i < tries; ++i) {
        std::string left;
        const int signals[] = {SIGHUP, SIGINT, SIGTERM};
        const int number = signals[moments.number(0, 2)];
        int status = 0;
        {
            const Fake rsync(RSYNC, SLOW);
            const pid_t run = start({"-r", "daily"});
            moments.pause(200);
            kill(run, number);
            status = wait_for(run);
            left = left_processes();
        }
        const std::string state = job_key(1, "state"); // 2: it had ended, or not begun
        interrupted += state == "8" ? 1 : 0;
        const bool in_order = state == "8" ? status == 128 + number && (left + left_files()).empty()
                                           : state == "2" || (state == "0" && i == 0);
        if (!in_order || exists(PID_FILE)) {
            ++failures;
            ADD_FAILURE() << number << " " << status << " state " << state << left << left_files();
        }
        if (!next_run_works()) ++failures;
    }
    EXPECT_GT(interrupted, tries / 4);
    expect_none_of(tries, failures, "signal at any moment: in order, next run works");
}

// Somebody else changes jobs all the time, so that runs and kills wait for the configuration's lock.
TEST_F(Holds, NoTwoTransfersOverlapHoweverRunsAndKillsMeet)
{
    const JobToHoldUp job(Keys{{"retry", "0"}});
    const Fake rsync(RSYNC, "case \"$*\" in *--dry-run*|*::) ;; *)\n"
                            "exec 9>>/tmp/transfer; flock -n 9 || echo overlap >>/tmp/overlaps\n"
                            "echo one >&9; sleep 0.02 9>&- ;; esac\n");
    const pid_t others = fork();
    if (others == 0) {
        execl("/bin/sh", "sh", "-c",
              "while :; do flock /tmp/rsync_write_conf.lock sleep 0.01; sleep 0.005; done", nullptr);
    }
    Moments moments;
    const int tries = rounds(25, 250);
    int failures = 0;
    for (int i = 0; i < tries; ++i) {
        std::vector<pid_t> all;
        for (int k = 0; k < 10; ++k) {
            all.push_back(start({moments.number(0, 1) == 0 ? "-k" : "-r", "daily"}));
            moments.pause(20);
        }
        for (const pid_t one : all)
            wait_for(one);
        if (exists(PID_FILE)) {
            ++failures;
            ADD_FAILURE() << "a pid file is left: " << read_file(PID_FILE);
            fs::remove(PID_FILE);
        }
    }
    kill(others, SIGKILL);
    wait_for(others);
    const int transfers = static_cast<int>(lines_of(read_file("/tmp/transfer")).size());
    const int overlaps = static_cast<int>(lines_of(read_file("/tmp/overlaps")).size());
    EXPECT_GT(transfers, tries / 2);
    EXPECT_EQ(overlaps, 0);
    expect_none_of(transfers, failures + overlaps, "runs and kills at once: no two transfers overlap");
}
