#include "cli/recover_list.h"
#include "common/run_options.h"
#include "config/job_list.h"
#include "config/job_state.h"
#include "config/process_guard.h"
#include "support.h"

#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace bakjob;
namespace fs = std::filesystem;

using Guard = Appliance;
using State = Appliance;
using RecoverListing = Appliance;

namespace
{

// A process that shows itself like that.
pid_t sleeper(const std::string &name)
{
    const pid_t child = fork();
    if (child == 0) execl("/bin/sleep", name.c_str(), "4711", nullptr);
    const std::string command = "/proc/" + std::to_string(child) + "/cmdline";
    EXPECT_TRUE(eventually([&] { return read_file(command).starts_with(name); }));
    return child;
}

} // namespace

TEST_F(Guard, ThePidFileIsMadeByOneRunAlone)
{
    const JobName name = named("it's $x");
    const std::string path = "/var/run/bakjob_it's $x.pid";
    EXPECT_TRUE(rsync_pid_file_absent(name));
    const PidFile own = rsync_write_pid_file(name);
    ASSERT_TRUE(own.handle);
    EXPECT_EQ(read_file(path), std::to_string(getpid()) + "\n");
    EXPECT_EQ(octal_mode(path), "644");
    EXPECT_FALSE(rsync_write_pid_file(name).handle);
    EXPECT_EQ(errno, EEXIST);
    EXPECT_EQ(rsync_remove_pid_file(own), 0);
    EXPECT_EQ(rsync_remove_pid_file(own), -1);
    const PidFile later = rsync_write_pid_file(name);
    const UniqueFd neighbours(open(path.c_str(), O_RDONLY));
    ASSERT_EQ(flock(neighbours.get(), LOCK_EX), 0);
    EXPECT_EQ(rsync_remove_pid_file(own), -1) << "another run's";
    EXPECT_EQ(rsync_remove_pid_file(later), 0) << "although somebody else locks it";

    fs::create_symlink("/tmp/target", path);
    EXPECT_FALSE(rsync_pid_file_absent(name)) << "a dangling link stands there too";
    EXPECT_FALSE(rsync_write_pid_file(name).handle);
    EXPECT_FALSE(exists("/tmp/target"));
}

TEST_F(Guard, KillingTakesTheProcessInThePidFileAndNothingElse)
{
    EXPECT_EQ(rsync_kill_job_process(named("none")), -1);
    for (const char *text : {"", "-1\n", "0\n", "12 34\n", "12;touch /tmp/x\n", "99999999999\n"}) {
        write_file("/var/run/bakjob_bad.pid", text);
        EXPECT_EQ(rsync_kill_job_process(named("bad")), -1) << text;
    }
    for (const bool restore : {false, true}) {
        run_options = {};
        const pid_t victim = sleeper(restore ? "bakjob -i / -r x" : "bakjob -r x");
        write_file("/var/run/bakjob_a b.pid", std::to_string(victim) + "\n");
        EXPECT_EQ(rsync_kill_job_process(named("a b")), 0);
        EXPECT_GT(wait_for(victim), 128);
        EXPECT_EQ(run_options.restore_mode, restore ? 1 : 0);
    }
}

TEST_F(Guard, TransfersAreFoundByTheirJobsNameTakenLiterally)
{
    // Whether a kill of the second job's transfers ends one of the first's.
    const std::map<std::pair<std::string, std::string>, bool> cases = {
        {{"daily", "daily"}, true}, {{"daily", "weekly"}, false},   {{"a.b", "a.b"}, true},
        {{"axb", "a.b"}, false},    {{"it's $x", "it's $x"}, true}, {{"^x$", "^x$"}, true},
        {{"b [1]", "b [1]"}, true}, {{"b 1", "b [1]"}, false}};
    for (const auto &[names, ends] : cases) {
        const pid_t transfer = sleeper("/usr/sbin/rsync --job-name=" + names.first);
        rsync_kill_transfers(named(names.second));
        const bool ended =
            eventually([&] { return waitpid(transfer, nullptr, WNOHANG) == transfer; }, ends ? 5 : 0);
        EXPECT_EQ(ended, ends) << names.first << " " << names.second;
        if (ended) continue;
        kill(transfer, SIGKILL);
        wait_for(transfer);
    }
    const Fake ps("/usr/local/sbin/ps", "[ \"$1\" = -ww ] && exit 1\n");
    EXPECT_EQ(rsync_ps_command(), "ps");
}

TEST_F(State, GoesToTheDirectionOfTheRun)
{
    add_job({{"job_name", "a"}, {"state", "7"}, {"rstate", "7"}});
    rsync_set_job_state("a", JOB_RUNNING);
    EXPECT_EQ(job_key(1, "state") + job_key(1, "rstate"), "37");
    const std::string time = job_key(1, "last_do_job_time");
    std::tm parsed{};
    EXPECT_NE(strptime(time.c_str(), "%a %b %d %Y %I:%M:%S %p", &parsed), nullptr) << time;
    EXPECT_EQ(read_file(FLASH), read_file(STORE));
    run_options.restore_mode = 1;
    rsync_set_job_state("a", JOB_FAILED);
    EXPECT_EQ(job_key(1, "state") + job_key(1, "rstate"), "34");
    EXPECT_EQ(job_key(1, "last_do_job_time"), time);

    const std::string before = read_file(STORE);
    rsync_set_job_state("unknown", JOB_DONE);
    EXPECT_EQ(read_file(STORE), before);
}

TEST_F(State, OnlyStaleStatesAreReset)
{
    const std::vector<std::pair<std::string, std::string>> states = {{"12", "8"},  {"3", "8"},   {"10", "8"},
                                                                     {"4", "4"},   {"9", "9"},   {"11", "11"},
                                                                     {"-3", "-3"}, {"13", "13"}, {"0", "0"}};
    for (const auto &[before, after] : states)
        add_job({{"job_name", "s" + before}, {"state", before}, {"rstate", before}});
    add_job({{"job_name", "alive"}, {"state", "3"}, {"rstate", "12"}});
    write_file("/var/run/bakjob_alive.pid", "1\n");
    EXPECT_EQ(bakjob_program("-a").status, 0);
    int item = 0;
    for (const auto &[before, after] : states) {
        EXPECT_EQ(job_key(++item, "state"), after);
        EXPECT_EQ(job_key(item, "rstate"), after);
        EXPECT_EQ(job_key(item, "last_do_job_time").size() > 20, before != after) << before;
    }
    EXPECT_EQ(job_key(10, "state") + job_key(10, "rstate"), "312");

    fs::remove(FLASH);
    const auto written = fs::last_write_time(STORE);
    EXPECT_EQ(bakjob_program("-a").status, 0);
    EXPECT_EQ(fs::last_write_time(STORE), written) << "nothing stale, nothing written";
    EXPECT_FALSE(exists(FLASH));
}

TEST_F(RecoverListing, NumbersTheSnapshotsInNameOrder)
{
    add_job({{"job_name", "job"}, {"backup_type", "2"}, {"inc_enable", "1"}, {"local_path", SHARE}});
    EXPECT_EQ(rsync_list_snapshots("job"), 0) << "no folder";
    fs::create_directories(SHARE);
    EXPECT_EQ(rsync_list_snapshots("job"), 0) << "nothing in it";
    write_file(SHARE + "/job.log", "no folder");
    EXPECT_EQ(rsync_list_snapshots("job"), 1);
    EXPECT_EQ(recover_list.count, 0);
    for (const char *name : {"job.x", "job.2", "job.0", "job.1", "jobs.0", "backup.0", ".job.0"})
        fs::create_directories(SHARE + "/" + name);
    shell("touch -d '2040-05-06 07:08:09' " + SHARE + "/job.1"); // beyond what 32 bits can tell
    run_options.debug_mode = 1;
    const auto trace = lines_of(printed_by([] { EXPECT_EQ(rsync_list_snapshots("job"), 1); }));
    ASSERT_EQ(trace.size(), 5U);
    EXPECT_EQ(trace[4], "scan file num [4]");
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(recover_list.entries[i].path, SHARE + "/job." + std::to_string(i));
        EXPECT_EQ(trace[static_cast<std::size_t>(i)], "[" + std::to_string(i + 1) + ". " +
                                                          recover_list.entries[i].time + ": " +
                                                          recover_list.entries[i].path + "]");
    }
    EXPECT_STREQ(recover_list.entries[1].time, "2040-05-06 07:08:09");
    for (int i = 3; i < 12; ++i)
        fs::create_directories(SHARE + "/job." + std::to_string(i));
    rsync_list_snapshots("job");
    EXPECT_EQ(recover_list.count, 10);
    EXPECT_EQ(recover_list.entries[9].seq, 10);
}

TEST_F(RecoverListing, TakesOnlyEnabledIncrementalPulls)
{
    for (const auto &[key, value] :
         Keys{{"backup_type", "1"}, {"inc_enable", "0"}, {"enable", "0"}, {"local_path", ""}}) {
        SetUp();
        fs::create_directories(SHARE + "/job.0");
        Keys keys{{"job_name", "job"}, {"backup_type", "2"}, {"inc_enable", "1"}, {"local_path", SHARE}};
        keys[key] = value;
        add_job(keys);
        EXPECT_EQ(rsync_list_snapshots("job"), 0) << key;
        EXPECT_EQ(rsync_job_list_empty(), 1);
    }
}
