// Snapshots under kills at any moment, and what somebody puts at their names at any moment.

#include "soak_support.h"
#include "transfer/snapshot_mark.h"

#include <algorithm>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <unistd.h>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

const std::string REMOTE = "/remote/backup/S1_remote_backup/daily/Public";

std::string snapshot(int number)
{
    return SHARE + "/daily." + std::to_string(number);
}

// Two states of the remote side, each with the number of its files in a file. The two numbers differ in
// length, as rsync takes files of one size and second for the same.
void set_remote_side(bool more)
{
    const std::string name = REMOTE + "/more";
    if (more) shell("mkdir " + name + "; cd " + name + " && seq 1000 | xargs touch");
    if (!more) fs::remove_all(name);
    write_file(REMOTE + "/count", more ? "1901" : "901");
}

bool is_whole(const std::string &path)
{
    const auto files =
        std::count_if(fs::recursive_directory_iterator(path), fs::recursive_directory_iterator(),
                      [](const auto &entry) { return entry.is_regular_file(); });
    return read_file(path + "/count") == std::to_string(files);
}

// The program and its commands in a process group of their own.
pid_t start_group()
{
    const pid_t run = fork();
    if (run != 0) {
        setpgid(run, run);
        return run;
    }
    setpgid(0, 0);
    dup2(open("/dev/null", O_WRONLY), STDERR_FILENO);
    execl("/usr/sbin/bakjob", "bakjob", "-r", "daily", nullptr);
    _exit(127);
}

} // namespace

TEST_F(Holds, AMarkedSnapshotIsWholeWhateverWasKilled)
{
    if (!mark_whole(SHARE)) GTEST_SKIP() << "no extended attributes of root's here";
    add_job({{"backup_type", "2"}, {"inc_enable", "1"}, {"inc_number", "3"}});
    shell("mkdir -p " + REMOTE + "/a && cd " + REMOTE + "/a && seq 900 | xargs touch");
    set_remote_side(false);
    wait_for(start({"-r", "daily"}));
    const auto whole = time_of_run({"-r", "daily"});
    Chance chance(1);
    int partial = 0;
    bool more = false;
    for (const std::string victim : {"cp", "mv", "rm", "run"}) {
        const int tries = rounds(2, 100);
        int failures = 0;
        for (int i = 0; i < tries; ++i) {
            set_remote_side(more = !more);
            {
                const std::string seconds =
                    "0." + std::to_string(1'000'000 + chance.number(0, 60'000)).substr(1);
                const Fake killed("/usr/local/bin/" + victim,
                                  "exec timeout -s KILL " + seconds + " /bin/" + victim + " \"$@\"\n");
                const pid_t run = start_group();
                if (victim == "run") {
                    chance.pause(whole);
                    kill(-run, SIGKILL);
                }
                wait_for(run);
            }
            for (int number = 0; number < 4; ++number) {
                const std::string path = snapshot(number);
                const bool there = exists(path);
                const bool has_all = there && is_whole(path);
                partial += there && !has_all ? 1 : 0;
                if (!there || has_all || !is_marked_whole(path)) continue;
                ++failures;
                ADD_FAILURE() << path << " after a kill of " << victim;
            }
            if (victim == "run") wait_for(start({"-k", "daily"}));
            wait_for(start({"-r", "daily"}));
            failures += is_marked_whole(snapshot(0)) && is_whole(snapshot(0)) ? 0 : 1;
        }
        expect_none_of(tries, failures, "SIGKILL of " + victim + " among snapshots: marked ones are whole");
    }
    EXPECT_GT(partial, 0) << "nothing was cut short: the kills came at the wrong moments";
}

// What is at the victim's, and whether it was touched.
static std::string victim()
{
    return shell("find /tmp/victim -printf '%p %T@ %n\\n' | sort; cat /tmp/victim/daily.0/secret").output;
}

TEST_F(Holds, NothingBehindALinkAmongSnapshotsIsReadOrChanged)
{
    struct Kind {
        std::vector<std::string> arguments;
        const char *state;
        const char *ended;
        std::vector<std::string> moments;
        Keys keys;
    };
    const std::vector<std::string> all = {"before", "list", "write", "rm", "mv", "cp", "dry", "run"};
    const Keys pull = {{"backup_type", "2"}, {"inc_enable", "1"}};
    const std::vector<Kind> kinds = {
        {{"-r", "daily"}, "state", "4", all, pull},
        {{"-i", "x", "-r", "daily"}, "rstate", "4", all, {{"inc_enable", "1"}}},
        {{"-n", "1", "-r", "daily"}, "state", "9", {"before", "write", "dry"}, pull}};
    const std::vector<std::string> plants = {"ln -s /tmp/victim ", "ln -s /tmp/victim/daily.0 ",
                                             "ln -s /tmp/made ", "mkfifo ", "echo x >"};
    // Does what the program does, and at the right moment puts something there.
    const auto with_plant = [](const std::string &kind, const std::string &program) {
        return kind + program + " \"$@\"\ncode=$?\n[ \"$kind\" != \"$(cat /tmp/moment 2>/dev/null)\" ] || " +
               "sh /tmp/plant\nexit $code\n";
    };
    const Fake rsync(RSYNC, with_plant(KIND_OF_CALL, RSYNC + ".real"));
    const Fake rm("/usr/local/bin/rm", with_plant("kind=rm\n", "/bin/rm"));
    const Fake mv("/usr/local/bin/mv", with_plant("kind=mv\n", "/bin/mv"));
    const Fake cp("/usr/local/bin/cp", with_plant("kind=cp\n", "/bin/cp"));
    Chance chance(2);
    const int tries = rounds(12, 100);
    int failures = 0;
    for (int i = 0; i < tries; ++i) {
        SetUp();
        const Kind kind = chance.one_of(kinds);
        const std::string moment = chance.one_of(kind.moments);
        const std::string path = snapshot(kind.arguments[0] == "-n" ? 0 : chance.number(0, 2));
        const std::string plant = "/bin/rm -rf " + path + "; " + chance.one_of(plants) + path + "\n";
        fs::remove_all("/remote/backup/S1_remote_backup/daily");
        write_file(REMOTE + "/file", "remote");
        for (int older = 0; older < 3; ++older)
            write_file(snapshot(older) + "/file", "local");
        write_file("/tmp/victim/daily.0/secret", "secret");
        write_file("/tmp/moment", moment);
        write_file("/tmp/plant", plant);
        const std::string before = victim();
        Keys keys = kind.keys;
        keys["inc_number"] = keys["retry"] = "3";
        add_job(keys);
        if (moment == "before") shell("sh /tmp/plant");
        const std::string trace = traced(kind.arguments);
        const bool refused = trace.find("ERROR: local_path refused: ") != std::string::npos;
        const bool sent = shell("grep -r secret /remote/backup").status == 0;
        if (job_key(1, kind.state) == kind.ended && refused && !sent && victim() == before &&
            !exists("/tmp/made"))
            continue;
        ++failures;
        ADD_FAILURE() << kind.arguments[0] << " " << moment << " " << plant << trace << victim();
    }
    expect_none_of(tries, failures, "links and files put among snapshots: nothing behind them touched");
}
