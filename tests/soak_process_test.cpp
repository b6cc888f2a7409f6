// What must hold at whatever moment a run is killed or interrupted, and however runs and kills of a job come
// together.

#include "process_support.h"

#include <csignal>
#include <filesystem>
#include <sys/wait.h>
#include <unistd.h>

namespace fs = std::filesystem;

namespace
{

using std::chrono::milliseconds;

// Every command takes a moment and leaves something behind that would live on.
const char *const SLOW = "(setsid sleep 4711 >/dev/null 2>&1 &); sleep 0.03\n";

} // namespace

TEST_F(Holds, OfManyRunsOfAJobOneStarts)
{
    // The one that runs goes on until the others have ended.
    const Fake rsync(RSYNC, KIND_OF_CALL + "[ $kind != run ] || { cat " + PID_FILE +
                                " >>/tmp/pids; until [ -e /tmp/go ]; do sleep 0.05; done; }\n");
    constexpr int RUNS = 64;
    const int tries = rounds(2, 20);
    int failures = 0;
    add_job({});
    for (int round = 0; round < tries; ++round) {
        shell("rm -f /tmp/pids /tmp/go");
        for (int i = 0; i < RUNS; ++i)
            start({"-r", "daily"});
        int refused = 0;
        int status = 0;
        const auto all_but_one_refused = [&] {
            while (waitpid(-1, &status, WNOHANG) > 0)
                refused += WEXITSTATUS(status) == 255 ? 1 : 0;
            return refused == RUNS - 1;
        };
        const bool alone = eventually(all_but_one_refused, 60);
        write_file("/tmp/go", "");
        const pid_t ran = wait(&status);
        const bool done = status == 0 && wait(nullptr) < 0 && !exists(PID_FILE);
        failures += alone && done && read_file("/tmp/pids") == std::to_string(ran) + "\n" ? 0 : 1;
    }
    expect_none_of(tries, failures, "64 simultaneous runs of a job: one runs");
}

TEST_F(Holds, AKilledRunIsGone)
{
    const JobToHoldUp job;
    const int tries = rounds(2, 20);
    for (const Phase &phase : phases()) {
        int failures = 0;
        for (int i = 0; i < tries; ++i) {
            std::string left;
            int ended = 0;
            {
                const Fake program(phase.program, phase.script);
                const pid_t run = start_until_there({"-r", "daily"});
                wait_for(start({"-k", "daily"}));
                left = left_processes();
                ended = wait_for(run);
            }
            const bool said = read_file("/tmp/output") == "kill rsync job success .....\n";
            const bool recorded = job_key(1, "state") == "11" && !exists(PID_FILE);
            if (ended == 128 + SIGKILL && left.empty() && said && recorded && next_run_works()) continue;
            ++failures;
            ADD_FAILURE() << phase.name << ended << said << recorded << left;
        }
        expect_none_of(tries, failures,
                       std::string("kill during a ") + phase.name + ": gone, next run works");
    }
}

TEST_F(Holds, AKillAtAnyMomentLeavesNothing)
{
    const JobToHoldUp job;
    Chance chance(1);
    const int tries = rounds(20, 100);
    int failures = 0;
    int killed = 0;
    for (int i = 0; i < tries; ++i) {
        std::string left;
        int ended = 0;
        {
            const Fake rsync(RSYNC, SLOW);
            const pid_t run = start({"-r", "daily"});
            chance.pause(milliseconds(200));
            wait_for(start({"-k", "daily"}));
            left = left_processes();
            ended = wait_for(run);
        }
        const bool was_killed = ended == 128 + SIGKILL; // else it had ended, or not begun
        killed += was_killed ? 1 : 0;
        if (was_killed ? !left.empty() || job_key(1, "state") != "11" : ended != 0) {
            ++failures;
            ADD_FAILURE() << ended << left;
        }
        if (!next_run_works()) ++failures;
    }
    EXPECT_GT(killed, tries / 4);
    expect_none_of(tries, failures, "kill at any moment: nothing goes on, next run works");
}

TEST_F(Holds, ASignalAtAnyMomentEndsTheRunInOrder)
{
    const JobToHoldUp job;
    Chance chance(1);
    const int tries = rounds(30, 100);
    int failures = 0;
    int interrupted = 0;
    for (int i = 0; i < tries; ++i) {
        const int number = chance.one_of(std::vector{SIGHUP, SIGINT, SIGTERM});
        std::string left;
        int ended = 0;
        {
            const Fake rsync(RSYNC, SLOW);
            const pid_t run = start({"-r", "daily"});
            chance.pause(milliseconds(200));
            kill(run, number);
            ended = wait_for(run);
            left = left_processes();
        }
        const std::string state = job_key(1, "state"); // 2: it had ended, or not begun
        interrupted += state == "8" ? 1 : 0;
        const bool in_order = state == "8" ? ended == 128 + number && (left + left_files()).empty()
                                           : state == "2" || (state == "0" && i == 0);
        if (!in_order || exists(PID_FILE)) {
            ++failures;
            ADD_FAILURE() << number << " " << ended << " state " << state << left << left_files();
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
    const Fake rsync(RSYNC, KIND_OF_CALL +
                                "[ $kind = run ] || exit 0\n"
                                "exec 9>>/tmp/transfer; flock -n 9 || echo overlap >>/tmp/overlaps\n"
                                "echo one >&9; sleep 0.02 9>&-\n");
    const pid_t others = fork();
    if (others == 0) {
        execl("/bin/sh", "sh", "-c",
              "while :; do flock /tmp/rsync_write_conf.lock sleep 0.01; sleep 0.005; done", nullptr);
    }
    Chance chance(1);
    const int tries = rounds(25, 250);
    int failures = 0;
    for (int i = 0; i < tries; ++i) {
        std::vector<pid_t> all;
        for (int k = 0; k < 10; ++k) {
            all.push_back(start({chance.number(0, 1) == 0 ? "-k" : "-r", "daily"}));
            chance.pause(milliseconds(20));
        }
        for (const pid_t one : all)
            wait_for(one);
        if (!exists(PID_FILE)) continue;
        ++failures;
        ADD_FAILURE() << "a pid file is left: " << read_file(PID_FILE);
        fs::remove(PID_FILE);
    }
    kill(others, SIGKILL);
    wait_for(others);
    const int transfers = static_cast<int>(lines_of(read_file("/tmp/transfer")).size());
    const int overlaps = static_cast<int>(lines_of(read_file("/tmp/overlaps")).size());
    EXPECT_GT(transfers, tries / 5);
    EXPECT_EQ(overlaps, 0);
    expect_none_of(transfers, failures + overlaps, "runs and kills at once: no two transfers overlap");
}
