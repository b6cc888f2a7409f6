// Whole runs against a real rsync daemon and a real ssh server.

#include "support.h"

#include <filesystem>

namespace fs = std::filesystem;

class RemoteSide : public Appliance
{
protected:
    void SetUp() override
    {
        Appliance::SetUp();
        shell("rm -f ~root/.ssh/known_hosts");
        add_share("Public", SHARE);
        write_file("/tmp/kv_serial.txt", "S1");
    }

    static void expect_state(int item, const std::string &state, const std::string &key = "state")
    {
        EXPECT_EQ(job_key(item, key), state) << shell("tail -5 /var/log/remote_rsyncd.log").output;
    }

    static void run(const std::string &arguments)
    {
        const Ran ran = bakjob_program("-d " + arguments);
        EXPECT_EQ(ran.status, 0) << ran.output;
        trace_ = ran.output;
    }

    // The store encodes the ssh password of ssh jobs only; other jobs bring it as base64 text.
    static constexpr const char *SSH_PASSWORD = "cm9vdHB3";
    static constexpr const char *SHARE = "/mnt/HD/HD_a2/Public";
    static inline std::string trace_;
};

TEST_F(RemoteSide, PushAndPullOverEveryAddressAndTransport)
{
    const std::string link_local = lines_of(read_file("/run/remote_link_local")).at(0);
    struct Way {
        Keys keys;
        std::string remote; // where the folder lands
    };
    const Keys ssh{{"rsync_mode", "1"},
                   {"use_ssh", "1"},
                   {"ssh_pwd", "rootpw"},
                   {"remote_path", "/remote/data/ssh"},
                   {"rsync_user", "root"}};
    const Keys same_kind{{"server_type", "1"}, {"rsync_user", "root"}, {"rsync_pwd", "pakto"}};
    const std::string below = "/S1_remote_backup/daily/Public/My Photos (1)/it's $x #1/f";
    for (const std::string &ip : {std::string("127.0.0.1"), std::string("::1"), link_local}) {
        for (const Keys &keys : {Keys{}, same_kind, ssh}) {
            const bool by_ssh = keys.contains("use_ssh");
            for (const std::string direction : {"1", "2"}) {
                SetUp();
                Keys all = keys;
                all["remote_ip"] = ip;
                all["backup_type"] = direction;
                all["local_path"] = std::string(SHARE) + "/My Photos (1)";
                if (!by_ssh) all["ssh_pwd"] = SSH_PASSWORD;
                add_job(all);
                const std::string local = SHARE + std::string("/My Photos (1)/it's $x #1/f");
                const std::string remote = (by_ssh ? "/remote/data/ssh" : "/remote/backup") + below;
                if (by_ssh) fs::create_directories("/remote/data/ssh/S1_remote_backup/daily/Public");
                if (ip == "::1") fs::create_directories("/remote/backup/S1_remote_backup/daily/Public");
                write_file(direction == "1" ? local : remote, "content");
                fs::create_directories(fs::path(local).parent_path().parent_path());
                run("-r daily");
                expect_state(1, "2");
                EXPECT_EQ(read_file(direction == "1" ? remote : local), "content")
                    << ip << " " << by_ssh << trace_;
            }
        }
    }
}

TEST_F(RemoteSide, SnapshotsKeepWhatOlderRunsFetched)
{
    const std::string name = "it's 100% $x #1";
    const std::string quoted = "\"it's 100% \\$x #1\"";
    add_job({{"job_name", name}, {"backup_type", "2"}, {"inc_enable", "1"}, {"inc_number", "3"}});
    const std::string remote = "/remote/backup/S1_remote_backup/" + name + "/Public/";
    const std::string base = std::string(SHARE) + "/" + name + ".";
    write_file(remote + "same", "same");
    for (const char *content : {"one", "two", "three", "four"}) {
        write_file(remote + "file", content);
        fs::last_write_time(remote + "file",
                            fs::file_time_type::clock::now() + std::chrono::seconds(content[1]));
        run("-r " + quoted);
        expect_state(1, "2");
    }
    EXPECT_EQ(read_file(base + "0/file") + read_file(base + "1/file") + read_file(base + "2/file"),
              "fourthreetwo");
    EXPECT_FALSE(exists(base + "3"));
    EXPECT_TRUE(fs::equivalent(base + "0/same", base + "2/same"));

    fs::remove_all(remote + "file");
    run("-n 3 -r " + quoted);
    expect_state(1, "2");
    EXPECT_EQ(read_file(remote + "file"), "two") << "snapshot 3 of the listing is number 2";
    EXPECT_NE(trace_.find("scan file num [3]\n"), std::string::npos);
}

TEST_F(RemoteSide, ARestoreRunBringsBackWhatWasDeleted)
{
    add_job({{"ssh_pwd", SSH_PASSWORD}, {"state", "4"}});
    write_file(std::string(SHARE) + "/d/file", "precious");
    run("-r daily");
    expect_state(1, "2");
    fs::remove_all(std::string(SHARE) + "/d");
    run("-i x -r daily");
    EXPECT_EQ(read_file(std::string(SHARE) + "/d/file"), "precious");
    expect_state(1, "2");
    expect_state(1, "2", "rstate");
    EXPECT_TRUE(alerts().back().starts_with("1 2403 daily,,Public")) << alerts().back();
}

TEST_F(RemoteSide, FailuresAreAlertsAndFailedJobs)
{
    struct Case {
        Keys keys;
        std::string trace;
    };
    const Keys ssh{{"use_ssh", "1"}, {"rsync_mode", "1"}, {"remote_path", "/remote/data"}};
    Keys wrong_login = ssh;
    wrong_login["ssh_pwd"] = "wrong";
    Keys no_login = ssh;
    const std::vector<Case> cases = {
        {{{"rsync_pwd", "wrong"}}, "--->[@ERROR: auth failed on module backup]"},
        {{{"remote_path", "nosuch"}}, "--->[@ERROR: Unknown module 'nosuch']"},
        {{{"remote_path", "archive"}}, "--->[ERROR: module is read only]"},
        {{{"remote_ip", "nosuch.invalid"}}, "--->["},
        {{{"backup_type", "2"}, {"remote_path", "data/missing"}}, "No such file or directory (2)]"},
        {wrong_login, "--->[root@127.0.0.1: Permission denied (publickey,password).]"},
        {no_login, "--->[root@127.0.0.1: Permission denied (publickey,password).]"}};
    for (const Case &one : cases) {
        SetUp();
        add_job(one.keys);
        write_file(std::string(SHARE) + "/file", "x");
        run("-r daily");
        expect_state(1, "4");
        EXPECT_EQ(alerts().size(), 1U);
        EXPECT_NE(trace_.find(one.trace), std::string::npos) << one.trace << "\n" << trace_;
    }
}

TEST_F(RemoteSide, AChangedHostKeyIsRepaired)
{
    add_job({{"use_ssh", "1"}, {"rsync_mode", "1"}, {"remote_path", "/remote/data"}, {"ssh_pwd", "rootpw"}});
    fs::create_directories("/remote/data/S1_remote_backup/daily");
    write_file(std::string(SHARE) + "/file", "x");
    shell("mkdir -p ~root/.ssh && ssh-keygen -q -t ed25519 -N '' -f /tmp/other && "
          "echo 127.0.0.1 $(cat /tmp/other.pub) >~root/.ssh/known_hosts");
    run("-r daily");
    expect_state(1, "2");
    EXPECT_NE(trace_.find("--->##### SERVER SSH key changed!"), std::string::npos) << trace_;
}

TEST_F(RemoteSide, KillEndsARunAndItsTransfersButNoOther)
{
    const std::string killed = "it's $x (1)";
    constexpr std::size_t BIG = 2'000'000; // bytes; slowed down below, still on its way when the kill comes
    for (const std::string &name : {killed, std::string("other")}) {
        add_job({{"job_name", name},

                 {"ssh_pwd", SSH_PASSWORD},
                 {"keep_exist_file", "2"}, // a restore of one folder would delete the other
                 {"local_path", SHARE + std::string("/") + name}});
        write_file(SHARE + std::string("/") + name + "/big",
                   std::string(name == killed ? BIG : BIG / 5, 'x'));
    }
    const auto start = [](const std::string &arguments) {
        shell("/usr/sbin/bakjob " + arguments + " >/dev/null 2>&1 &");
    };
    const auto transferring = [](const std::string &name) {
        return shell("ps | grep -F '/usr/sbin/rsync --job-name=" + name +
                     "' | grep -F -- '--bwlimit' | grep -v grep")
                   .status == 0;
    };
    start("-r \"it's \\$x (1)\""); // so that there is something to restore
    ASSERT_TRUE(eventually([&] { return job_key(1, "state") == "2"; }));
    for (const bool restore : {false, true}) {
        write_file(SHARE + std::string("/") + killed + "/big", std::string(BIG, restore ? 'y' : 'z'));
        const Fake slow(
            "/usr/sbin/rsync",
            "case \"$*\" in --server*|*--dry-run*|*::) ;; *) set -- --bwlimit=100 \"$@\" ;; esac\n"
            "exec /usr/sbin/rsync.real \"$@\"\n");
        start(std::string(restore ? "-i x " : "") + "-r \"it's \\$x (1)\"");
        start("-r other");
        ASSERT_TRUE(eventually([&] { return transferring("it") && transferring("other"); }));
        EXPECT_EQ(bakjob_program("-d -r other").status, 255) << "a second run of a running job";
        const Ran kill = bakjob_program("-k \"it's \\$x (1)\"");
        EXPECT_EQ(kill.output, "kill rsync job success .....\n");
        EXPECT_TRUE(eventually([&] { return !transferring("it"); }, 5));
        EXPECT_NE(shell("ps | grep -F \"bakjob \" | grep -F \"it's\" | grep -v grep").status, 0);
        EXPECT_EQ(job_key(1, "state") + " " + job_key(1, "rstate"), restore ? "11 11" : "11 0");
        EXPECT_FALSE(exists("/var/run/bakjob_" + killed + ".pid"));
        EXPECT_FALSE(exists("/tmp/rsync_bakcup_src_folder_name." + killed));
        EXPECT_TRUE(eventually(
            [&] { return job_key(2, "state") == "2" && !exists("/var/run/bakjob_other.pid"); }, 20))
            << "the other job goes on";
        fs::remove_all("/remote/backup/S1_remote_backup/other");
    }
    run("-r \"it's \\$x (1)\"");
    expect_state(1, "2");
}
