// A machine that fails in the midst of a command: system calls that answer with an error, memory that ends.
// No job is lost, no file is half old and half new, and nobody is told of a success that there was not.

#include "ctl_support.h"
#include "soak_support.h"

#include <array>
#include <filesystem>
#include <regex>

namespace fs = std::filesystem;

namespace
{

struct Command {
    const char *words;
    bool by_status; // its exit status tells whether it was done; of bakjob, states and traces do
};

constexpr std::array COMMANDS = {
    Command{"bakjobctl add new remote_ip=127.0.0.1 remote_path=backup local_path=/mnt/HD/HD_a2/Public", true},
    Command{"bakjobctl set one retry=2 user_description=changed", true},
    Command{"bakjobctl delete two", true},
    Command{"bakjobctl disable one", true},
    Command{"bakjobctl schedule two '5 4 * * *'", true},
    Command{"bakjob -r one", false},
    Command{"bakjob -k three", false},
    Command{"bakjob -a", false},
};

constexpr const char *COPY = "/remote/backup/S1_remote_backup/one/Public/file";
// Where a run copies to that cannot read the serial text.
constexpr const char *COPY_WITHOUT_SERIAL = "/remote/backup/_remote_backup/one/Public/file";
constexpr const char *UNRECORDED = "/var/run/bakjob_one.unrecorded";
// Of the store, flash and cron's file. A run passes through states, and one that is broken off may leave any
// of them.
std::vector<std::string> contents()
{
    static const std::regex states("<(state|last_do_job_time)>[^<]*<");
    std::vector<std::string> all;
    for (const std::string &path : {STORE, FLASH, CRON})
        all.push_back(std::regex_replace(read_file(path), states, "<$1><"));
    return all;
}

class HoldsThroughFaults : public Holds
{
protected:
    void SetUp() override
    {
        Holds::SetUp();
        for (const char *name : {"one", "two", "three"})
            add_job({{"job_name", name}, {"state", std::string(name) == "one" ? "0" : "3"}});
        ASSERT_EQ(ctl("schedule two '1 2 * * *'").status, 0);
        remember();
    }

    // What each command begins with, from now on.
    void remember()
    {
        ASSERT_EQ(shell("tar -cPf /var/tmp/kept " + STORE + " " + FLASH + " " + CRON).status, 0);
        before_ = contents();
    }

    void TearDown() override
    {
        shell("rm -f /var/tmp/kept /var/run/bakjob_*");
        Holds::TearDown();
    }

    // Puts back what each command begins with.
    static void put_back()
    {
        const std::string remote = "/remote/backup/S1_remote_backup/one";
        shell("rm -rf /etc/NAS_CFG/* /var/lib/device_flash/* /var/run/bakjob_* /tmp/r_* /tmp/rsync_* " +
              remote + "/* /remote/backup/_remote_backup; mkdir -p " + remote + "; tar -xPf /var/tmp/kept");
        write_file("/var/run/bakjob_three.pid", "2147483646\n");
    }

    void learn(const Command &command)
    {
        put_back();
        const Ran ran = shell("/usr/sbin/" + std::string(command.words) + " 2>&1");
        ASSERT_EQ(ran.status, 0) << command.words << ran.output;
        after_ = contents();
        ASSERT_EQ(exists(COPY), std::string(command.words) == "bakjob -r one") << ran.output;
    }

    // Nothing, or what is wrong after a command that met a fault.
    [[nodiscard]] std::string wrong(const Command &command, const Ran &ran) const
    {
        const auto now = contents();
        for (std::size_t i = 0; i < now.size(); ++i)
            if (now[i] != before_[i] && now[i] != after_[i])
                return std::vector{"store", "flash", "cron"}[i] + std::string(" is neither old nor new");
        if (now[0] == before_[0] && now[1] != before_[1]) return "flash is ahead of the store";
        if (command.by_status && ran.status == 0 && now != after_) return "success was told";
        const bool done = read_file(STORE).find("<state>2</state>") != std::string::npos;
        const bool copied = exists(COPY) || exists(COPY_WITHOUT_SERIAL);
        if (done && !exists(UNRECORDED) && !copied) return "a success was recorded";
        return "";
    }

    // Runs it with words in front, and counts.
    void meet(const Command &command, const std::string &fault)
    {
        put_back();
        const Ran ran = shell(fault + " /usr/sbin/" + command.words + " 2>&1");
        const std::string what = wrong(command, ran);
        ++tries_;
        if (what.empty()) return;
        ++failures_;
        ADD_FAILURE() << what << ": " << fault << ' ' << command.words << "\nexit status " << ran.status
                      << '\n'
                      << ran.output;
    }

    int tries_ = 0;
    int failures_ = 0;

private:
    std::vector<std::string> before_;
    std::vector<std::string> after_;
};

} // namespace

TEST_F(HoldsThroughFaults, SystemCallsThatFail)
{
    if (shell("strace -o /dev/null true 2>&1").status != 0) GTEST_SKIP() << "strace cannot trace here";
    constexpr std::array ERRORS = {"EIO", "ENOSPC", "EMFILE", "ENOMEM", "EINTR"};
    // In the tests all calls that read the store, and some of those that write.
    const std::vector<std::pair<std::string, bool>> calls = {
        {"openat", true}, {"read", true},    {"newfstatat", true}, {"write", false},
        {"fsync", false}, {"rename", false}, {"fchmod", false}};
    int turn = 0;
    for (const Command &command : COMMANDS) {
        learn(command);
        for (const auto &[call, reads] : calls) {
            const bool all_files = soak_table() != nullptr || !reads;
            const std::string trace =
                "strace " + (all_files ? std::string() : "-P " + STORE) + " -e trace=" + call;
            put_back();
            shell(trace + " -o /var/tmp/calls /usr/sbin/" + command.words);
            const int all = std::stoi(shell("grep -c '^" + call + "(' /var/tmp/calls").output);
            for (int n = all; n > 0; n -= reads ? 1 : rounds(std::max(1, all / 2), 1)) {
                for (int i = 0; i < rounds(1, ERRORS.size()); ++i) {
                    const char *const error = ERRORS[static_cast<std::size_t>(turn++) % ERRORS.size()];
                    meet(command, trace + " -o /dev/null -e inject=" + call + ":error=" + error +
                                      ":when=" + std::to_string(n));
                }
            }
        }
    }
    expect_none_of(tries_, failures_, "a failing system call loses or fakes something");
}

TEST_F(HoldsThroughFaults, MemoryThatEnds)
{
    const std::string library = fs::read_symlink("/proc/self/exe").parent_path() / "libfailing_malloc.so";
    const std::string preload = "env LD_PRELOAD=" + library;
    for (const Command &command : COMMANDS) {
        learn(command);
        put_back();
        shell(preload + " FAIL_COUNT=/var/tmp/allocations /usr/sbin/" + command.words);
        const int all = std::stoi(read_file("/var/tmp/allocations"));
        ASSERT_GT(all, 30) << command.words;
        const int step = std::max(1, all / rounds(6, 220));
        for (int n = all; n > 0; n -= step) {
            const std::string at = preload + " FAIL_AT=" + std::to_string(n);
            meet(command, at);
            meet(command, at + " FAIL_ON=1");
        }
    }
    expect_none_of(tries_, failures_, "an allocation that fails loses or fakes something");
}

// The limit is swept over all sizes at which a command ends somewhere between its start and its end.
TEST_F(HoldsThroughFaults, AddressSpaceThatEnds)
{
    for (int i = 0; i < 300; ++i)
        add_job({{"job_name", "many" + std::to_string(i)}});
    remember();
    const Command &add = COMMANDS[0];
    learn(add);
    const auto runs_in = [&](int kilobytes) {
        put_back();
        return shell("(ulimit -v " + std::to_string(kilobytes) + "; /usr/sbin/" + add.words + ") 2>&1")
                   .status == 0;
    };
    int enough = 65536;
    int too_small = 1024;
    while (enough - too_small > 64) {
        const int middle = (enough + too_small) / 2;
        (runs_in(middle) ? enough : too_small) = middle;
    }
    const int tries = rounds(20, 2000);
    const int lowest = enough / 4;
    for (int i = 0; i < tries; ++i) {
        const int kilobytes = lowest + static_cast<int>(static_cast<long>(enough - lowest) * i / tries);
        meet(add, "ulimit -v " + std::to_string(kilobytes) + "; exec");
    }
    expect_none_of(tries_, failures_, "an address space that ends loses or fakes something");
}
