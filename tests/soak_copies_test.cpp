// Snapshots under kills at any moment, and what somebody puts at their names at any moment.

#include "soak_support.h"
#include "transfer/snapshot_mark.h"

#include <algorithm>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <random>
#include <unistd.h>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

constexpr const char *REMOTE = "/remote/backup/S1_remote_backup/daily/Public";

std::string snapshot(int number)
{
    return SHARE + std::string("/daily.") + std::to_string(number);
}

void make_script(const std::string &path, const std::string &script)
{
    write_file(path, "#!/bin/sh\n" + script);
    fs::permissions(path, fs::perms(0755));
}

// Two states of the remote side, each with the number of its files in the file that is sent first.
void set_remote_side(bool more)
{
    const std::string name = REMOTE + std::string("/more");
    if (more) shell("mkdir " + name + "; cd " + name + " && seq 1000 | xargs touch");
    if (!more) fs::remove_all(name);
    write_file(REMOTE + std::string("/count"), more ? "2001" : "1001");
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
    shell(std::string("mkdir -p ") + REMOTE + "/a && cd " + REMOTE + "/a && seq 1000 | xargs touch");
    set_remote_side(false);
    wait_for(start({"-r", "daily"}));
    const auto begin = std::chrono::steady_clock::now();
    wait_for(start({"-r", "daily"}));
    const auto whole =
        std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - begin);
    std::mt19937 random(1);
    const auto within = [&](auto most) {
        return std::uniform_int_distribution<useconds_t>(0, static_cast<useconds_t>(most))(random);
    };
    int partial = 0;
    bool more = false;
    for (const std::string victim : {"cp", "mv", "rm", "run"}) {
        const int tries = rounds(2, 100);
        int failures = 0;
        for (int i = 0; i < tries; ++i) {
            set_remote_side(more = !more);
            const std::string front = "/usr/local/bin/" + victim;
            const std::string seconds = "0." + std::to_string(1'000'000 + within(60'000)).substr(1);
            make_script(front, "exec timeout -s KILL " + seconds + " /bin/" + victim + " \"$@\"\n");
            const pid_t run = start_group();
            if (victim == "run") {
                usleep(within(whole.count()));
                kill(-run, SIGKILL);
            }
            wait_for(run);
            fs::remove(front);
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
    const std::vector<Kind> kinds = {
        {{"-r", "daily"}, "state", "4", all, {{"backup_type", "2"}, {"inc_enable", "1"}}},
        {{"-i", "x", "-r", "daily"}, "rstate", "4", all, {{"inc_enable", "1"}}},
        {{"-n", "1", "-r", "daily"},
         "state",
         "9",
         {"before", "write", "dry"},
         {{"backup_type", "2"}, {"inc_enable", "1"}}}};
    const std::vector<std::string> plants = {"ln -s /tmp/victim ", "ln -s /tmp/victim/daily.0 ",
                                             "ln -s /tmp/made ", "mkfifo ", "echo x >"};
    // Does what the program does, and at the right moment puts something there.
    const std::string behind =
        "code=$?\n[ \"$kind\" != \"$(cat /tmp/moment 2>/dev/null)\" ] || sh /tmp/plant\nexit $code\n";
    const Fake rsync("/usr/sbin/rsync",
                     "case $* in\n*--server*) kind=none ;;\n*--job-name=*--dry-run*) kind=dry ;;\n"
                     "*--job-name=*) kind=run ;;\n*--dry-run*) kind=write ;;\n*) kind=list "
                     ";;\nesac\n/usr/sbin/rsync.real \"$@\"\n" +
                         behind);
    for (const std::string program : {"rm", "mv", "cp"})
        make_script("/usr/local/bin/" + program,
                    "kind=" + program + "\n/bin/" + program + " \"$@\"\n" + behind);
    const auto victim = [] {
        return shell("find /tmp/victim -printf '%p %T@ %n\\n' | sort; cat /tmp/victim/daily.0/secret").output;
    };
    std::mt19937 random(2);
    const auto one_of = [&](const auto &choices) {
        return choices[std::uniform_int_distribution<std::size_t>(0, choices.size() - 1)(random)];
    };
    const int tries = rounds(12, 100);
    int failures = 0;
    for (int i = 0; i < tries; ++i) {
        SetUp();
        const Kind kind = one_of(kinds);
        const std::string moment = one_of(kind.moments);
        const bool recovers = kind.arguments[0] == "-n";
        const int number = recovers ? 0 : one_of(std::vector{0, 1, 2});
        const std::string plant =
            "/bin/rm -rf " + snapshot(number) + "; " + one_of(plants) + snapshot(number) + "\n";
        fs::remove_all("/remote/backup/S1_remote_backup/daily");
        write_file(REMOTE + std::string("/file"), "remote");
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
    for (const char *program : {"rm", "mv", "cp"})
        fs::remove(std::string("/usr/local/bin/") + program);
    expect_none_of(tries, failures, "links and files put among snapshots: nothing behind them touched");
}
