// The lock of the job list and the discovery's, among processes that share them and neighbours who want to
// hold them or hide them.

#include "common/job_files.h"
#include "common/text.h"
#include "config/config_lock.h"
#include "config/current_job.h"
#include "ctl_support.h"
#include "remote/discovery.h"

#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

const std::string LOCK = CONFIG_LOCK_FILE;

// A process that goes when this goes.
class Child
{
public:
    explicit Child(const std::function<void()> &body) : pid_(fork())
    {
        if (pid_ != 0) return;
        body();
        _exit(0);
    }
    Child(const Child &) = delete;
    Child &operator=(const Child &) = delete;
    ~Child()
    {
        kill(pid_, SIGKILL);
        waitpid(pid_, nullptr, 0);
    }
    [[nodiscard]] pid_t pid() const { return pid_; }

private:
    pid_t pid_;
};

ino_t inode(const std::string &path)
{
    struct stat status = {};
    return lstat(path.c_str(), &status) == 0 ? status.st_ino : 0;
}

// A regular file of root's that nobody else opens and that has no other name.
bool is_lock(const std::string &path)
{
    struct stat status = {};
    return lstat(path.c_str(), &status) == 0 && status.st_mode == (S_IFREG | 0600U) && status.st_uid == 0 &&
           status.st_nlink == 1;
}

std::vector<std::string> moved_aside()
{
    std::vector<std::string> found;
    for (const auto &entry : fs::directory_iterator("/tmp"))
        if (entry.path().string().starts_with(LOCK + ".aside.")) found.push_back(entry.path());
    return found;
}

// Holds a lock, taken in whatever way, until /tmp/go appears; it is taken when the construction is done.
class Holder : public Child
{
public:
    explicit Holder(const std::function<UniqueFd()> &take)
        : Child([take] {
              const UniqueFd held = take();
              write_file("/tmp/held", "");
              eventually([] { return exists("/tmp/go"); }, 60);
              write_file("/tmp/released", "");
          })
    {
        EXPECT_TRUE(eventually([] { return exists("/tmp/held"); }));
        fs::remove("/tmp/held");
    }
};

UniqueFd take(const std::string &path = LOCK)
{
    return rsync_lock_config(path.c_str());
}

UniqueFd as_older_programs_do(const std::string &path)
{
    UniqueFd file(open(path.c_str(), O_RDONLY));
    flock(file.get(), LOCK_EX);
    return file;
}

// Takes the lock, and tells whether it was free by then.
void take_it()
{
    const UniqueFd lock = take();
    write_file("/tmp/got", !lock ? "no lock" : exists("/tmp/released") ? "in turn" : "too early");
}

std::string got()
{
    EXPECT_TRUE(eventually([] { return read_file("/tmp/got").size() > 6; }));
    return read_file("/tmp/got");
}

testing::AssertionResult waits_for(const Child &child, const std::string &path)
{
    if (eventually([&] { return has_open(child.pid(), path); })) return testing::AssertionSuccess();
    return testing::AssertionFailure() << "nobody waits for " << path;
}

std::string as_neighbour(const std::string &command)
{
    return "setpriv --reuid=65534 --regid=65534 --clear-groups sh -c '" + command + "'";
}

void plant_socket()
{
    in_child([] {
        become_neighbour();
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        copy_text(address.sun_path, LOCK);
        const UniqueFd planted(socket(AF_UNIX, SOCK_STREAM, 0));
        return bind(planted.get(), reinterpret_cast<sockaddr *>(&address), sizeof address);
    });
}

using ConfigLock = Ctl;

} // namespace

TEST_F(ConfigLock, IsExclusive)
{
    const UniqueFd lock = take();
    ASSERT_TRUE(lock);
    EXPECT_TRUE(is_lock(LOCK));
    const UniqueFd other(open(LOCK.c_str(), O_RDONLY));
    EXPECT_NE(flock(other.get(), LOCK_EX | LOCK_NB), 0);
    EXPECT_FALSE(exists(LOCK_GUARD_FILE)) << "only where there is something to guard against";
    EXPECT_FALSE(rsync_lock_config("/no/such/folder/lock"));
    EXPECT_EQ(errno, ENOENT);
}

TEST_F(ConfigLock, WhateverElseIsThereGivesWay)
{
    const std::vector<std::string> planted = {as_neighbour("mkdir " + LOCK),
                                              as_neighbour("mkdir " + LOCK + " && echo his >" + LOCK + "/x"),
                                              as_neighbour("echo his >" + LOCK),
                                              as_neighbour("umask 777; touch " + LOCK),
                                              as_neighbour("ln -s /tmp/victim " + LOCK),
                                              as_neighbour("ln -s /tmp/made " + LOCK),
                                              as_neighbour("mkfifo " + LOCK),
                                              "mknod " + LOCK + " c 1 3",
                                              "mkdir " + LOCK,
                                              "ln /tmp/victim " + LOCK,
                                              "a socket"};
    for (const std::string &plant : planted) {
        SetUp();
        write_file("/tmp/victim", "kept");
        if (plant == "a socket") plant_socket();
        if (plant != "a socket") shell(plant);
        const ino_t foreign = inode(LOCK);
        ASSERT_NE(foreign, 0U) << plant;
        for (int i = 0; i < 2; ++i) {
            EXPECT_TRUE(take()) << plant;
            EXPECT_TRUE(is_lock(LOCK)) << plant;
            ASSERT_EQ(moved_aside().size(), 1U) << plant;
        }
        EXPECT_EQ(inode(moved_aside()[0]), foreign) << plant;
        EXPECT_EQ(read_file("/tmp/victim") + octal_mode("/tmp/victim"), "kept644") << plant;
        EXPECT_FALSE(exists("/tmp/made"));
    }
    EXPECT_EQ(octal_mode(LOCK_GUARD_FILE), "600");

    SetUp();
    shell(as_neighbour("mkdir " + LOCK));
    const ReadOnly no_guard("/run");
    EXPECT_FALSE(take());
    EXPECT_EQ(errno, EROFS);
    EXPECT_TRUE(moved_aside().empty());
}

TEST_F(ConfigLock, NobodyWaitsForANeighboursFile)
{
    const Holder neighbour([] {
        become_neighbour();
        write_file(LOCK, "");
        return as_older_programs_do(LOCK);
    });
    take_it();
    EXPECT_EQ(got(), "too early") << "the neighbour still holds what was his";
}

TEST_F(ConfigLock, OneThatOthersCouldOpenIsMendedAndHonoured)
{
    shell("umask 022; touch " + LOCK);
    const ino_t older = inode(LOCK);
    const Holder holder([] { return as_older_programs_do(LOCK); });
    const Child waiter(take_it);
    ASSERT_TRUE(waits_for(waiter, LOCK));
    EXPECT_TRUE(is_lock(LOCK));
    EXPECT_NE(shell(as_neighbour("flock --nonblock " + LOCK + " true") + " 2>/dev/null").status, 0);
    write_file("/tmp/go", "");
    EXPECT_EQ(got(), "in turn");
    EXPECT_EQ(inode(LOCK), older);
}

TEST_F(ConfigLock, OneThatIsReplacedInAWaitIsWaitedForAnew)
{
    const Holder holder([] { return take(); });
    const Child waiter(take_it);
    ASSERT_TRUE(waits_for(waiter, LOCK));
    fs::rename(LOCK, "/tmp/replaced");
    UniqueFd newer = take();
    write_file("/tmp/go", "");
    EXPECT_TRUE(waits_for(waiter, LOCK));
    EXPECT_FALSE(exists("/tmp/got"));
    newer.reset();
    got();
}

// He opened the file while everybody could.
TEST_F(ConfigLock, ANeighbourWhoGotHoldOfAnOldLockIsPassedBy)
{
    for (const bool by_another : {false, true}) { // that has ended since
        SetUp();
        write_file(LOCK, "");
        fs::permissions(LOCK, fs::perms(0644));
        const Holder neighbour([by_another] {
            become_neighbour();
            if (!by_another) return as_older_programs_do(LOCK);
            UniqueFd file(open(LOCK.c_str(), O_RDONLY));
            in_child([&] { return flock(file.get(), LOCK_EX); });
            return file;
        });
        take_it();
        EXPECT_EQ(got(), "too early");
        EXPECT_TRUE(is_lock(LOCK));
    }
}

// Where the kernel lets a neighbour give another name to a file that he cannot open.
TEST_F(ConfigLock, AnHonestHolderOfOneWithTwoNamesIsWaitedFor)
{
    const Holder holder([] { return take(); });
    fs::create_hard_link(LOCK, "/tmp/second");
    const Child waiter(take_it);
    // By now it may have another name still.
    ASSERT_TRUE(eventually([&] { return has_open(waiter.pid(), "/tmp/second"); }));
    write_file("/tmp/go", "");
    EXPECT_EQ(got(), "in turn");
    EXPECT_TRUE(is_lock(LOCK));

    // A daemon holds a file of its own for ever.
    fs::remove("/tmp/go");
    const Holder daemon([] {
        write_file("/tmp/daemon.pid", "1");
        return as_older_programs_do("/tmp/daemon.pid");
    });
    fs::remove(LOCK);
    fs::create_hard_link("/tmp/daemon.pid", LOCK);
    EXPECT_TRUE(take());
    EXPECT_EQ(octal_mode("/tmp/daemon.pid"), "644");
}

TEST_F(ConfigLock, WithoutOneARunGoesOnAndPeopleChangeNothing)
{
    add_job({{"state", "3"}});
    const std::string before = read_file(STORE);
    const ReadOnly nothing_is_made("/tmp");
    const std::string why = LOCK + " cannot be locked: Read-only file system";
    for (const char *change : {"set daily retry=7", "disable daily", "schedule daily '0 3 * * *'",
                               "add b remote_ip=a remote_path=b local_path=/mnt/HD/HD_a2/Public"})
        EXPECT_TRUE(says(ctl(change), 3, "bakjobctl: " + why + "; nothing is changed\n")) << change;
    EXPECT_EQ(read_file(STORE), before);
    EXPECT_FALSE(exists(CRON));
    EXPECT_TRUE(says(ctl("show daily"), 0, "daily"));
    EXPECT_TRUE(says(bakjob_program("-d -a"), 0,
                     "ERROR: [" + why.substr(0, LOCK.size()) + "]" + why.substr(LOCK.size()) + "\n"));
    EXPECT_EQ(job_key(1, "state"), "8");
}

TEST_F(ConfigLock, PeopleAreToldWhatTheyWaitFor)
{
    add_job({});
    const Holder holder([] {
        prctl(PR_SET_NAME, "ev\033il (x");
        return take();
    });
    const Child person([] { _exit(shell("bakjobctl set daily retry=7 >/tmp/said 2>&1").status); });
    const std::string told = "bakjobctl: waiting for " + LOCK + ", which process " +
                             std::to_string(holder.pid()) + " (ev?il (x) holds\n";
    EXPECT_TRUE(eventually([&] { return read_file("/tmp/said") == told; })) << read_file("/tmp/said");
    EXPECT_EQ(job_key(1, "retry"), "0");
    write_file("/tmp/go", "");
    EXPECT_EQ(wait_for(person.pid()), 0);
    EXPECT_EQ(job_key(1, "retry"), "7");
    EXPECT_EQ(read_file("/tmp/said"), told) << "once";
}

TEST_F(ConfigLock, ADiscoveryLooksAloneAtItsCopy)
{
    const Fake ssh(SSH, "echo >>/tmp/calls; echo '[ m ]'; echo 'path = /m'\n");
    shell(as_neighbour(std::string("mkdir ") + DISCOVERY_LOCK_FILE));
    CurrentJob = make_job("daily");
    CurrentJob.server_type = 1;
    copy_text(CurrentJob.ssh_pwd, "c3No");
    const Holder other([] { return take(DISCOVERY_LOCK_FILE); });
    const Child discovery(rsync_discover_remote);
    EXPECT_TRUE(waits_for(discovery, DISCOVERY_LOCK_FILE));
    EXPECT_FALSE(exists("/tmp/calls"));
    write_file("/tmp/go", "");
    EXPECT_TRUE(eventually([] { return exists("/tmp/calls"); }));
}
