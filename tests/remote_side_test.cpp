// Whole runs against a real rsync daemon and a real ssh server.

#include "support.h"

#include <filesystem>

namespace fs = std::filesystem;

class RemoteSide : public ApplianceWithShare
{
protected:
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
    static inline std::string trace_;
};

TEST_F(RemoteSide, PushAndPullOverEveryAddressAndTransport)
{
    const Keys daemon{{"ssh_pwd", SSH_PASSWORD}};
    const Keys same_kind = keys_of("server_type=1 rsync_user=root rsync_pwd=pakto ssh_pwd=cm9vdHB3");
    const Keys ssh =
        keys_of("rsync_mode=1 use_ssh=1 ssh_pwd=rootpw remote_path=/remote/data/ssh rsync_user=root");
    const std::string link_local = lines_of(read_file("/run/remote_link_local")).at(0);
    const std::string name = "/My Photos (1)";
    const std::string file = name + "/it's $x #1/f";
    bool push = false; // in turn: each address and each transport sees both directions
    for (const std::string &ip : {std::string("127.0.0.1"), std::string("::1"), link_local}) {
        for (const Keys &keys : {daemon, same_kind, ssh}) {
            SetUp();
            push = !push;
            Keys all = keys;
            all["remote_ip"] = ip;
            all["backup_type"] = push ? "1" : "2";
            all["local_path"] = SHARE + name;
            add_job(all);
            const bool by_ssh = keys.contains("use_ssh");
            const std::string below = std::string(by_ssh ? "/remote/data/ssh" : "/remote/backup") +
                                      "/S1_remote_backup/daily/Public";
            // A daemon's folder is made by the run, which takes a second.
            if (by_ssh || ip != link_local) fs::create_directories(below);
            fs::create_directories(SHARE + name);
            write_file((push ? SHARE : below) + file, "content");
            run("-r daily");
            expect_state(1, "2");
            EXPECT_EQ(read_file((push ? below : SHARE) + file), "content") << ip << by_ssh << push << trace_;
        }
    }
}

TEST_F(RemoteSide, SnapshotsKeepWhatOlderRunsFetched)
{
    const std::string name = "it's 100% $x #1";
    const std::string quoted = "\"it's 100% \\$x #1\"";
    add_job({{"job_name", name}, {"backup_type", "2"}, {"inc_enable", "1"}, {"inc_number", "3"}});
    const std::string remote = "/remote/backup/S1_remote_backup/" + name + "/Public/";
    const std::string base = SHARE + "/" + name + ".";
    const auto age = [&](int number) {
        return fs::file_time_type::clock::now() - fs::last_write_time(base + std::to_string(number));
    };
    using std::chrono::minutes;
    write_file(remote + "same", "same");
    for (const char *content : {"one", "two", "three", "four"}) {
        write_file(remote + "file", content);
        fs::last_write_time(remote + "file",
                            fs::file_time_type::clock::now() + std::chrono::seconds(content[1]));
        fs::last_write_time(remote, fs::file_time_type::clock::now() - minutes(99));
        run("-r " + quoted);
        expect_state(1, "2");
        EXPECT_LT(age(0), minutes(1)) << "of its run, not of the folder over there";
        fs::last_write_time(base + "0", fs::file_time_type::clock::now() - minutes(content[0]));
    }
    EXPECT_TRUE(age(1) >= minutes('t') && age(1) < minutes('t' + 1)) << "the others keep theirs";
    EXPECT_EQ(read_file(base + "0/file") + read_file(base + "1/file") + read_file(base + "2/file"),
              "fourthreetwo");
    EXPECT_FALSE(exists(base + "3"));
    EXPECT_TRUE(fs::equivalent(base + "0/same", base + "2/same"));

    fs::remove_all(remote + "file");
    run("-n 3 -r " + quoted);
    expect_state(1, "2");
    EXPECT_EQ(read_file(remote + "file"), "two") << "snapshot 3 of the listing is number 2";
    EXPECT_TRUE(has(trace_, "scan file num [3]\n"));
}

TEST_F(RemoteSide, ARestoreRunBringsBackWhatWasDeleted)
{
    add_job({{"ssh_pwd", SSH_PASSWORD}, {"state", "4"}});
    write_file(SHARE + "/d/file", "precious");
    run("-r daily");
    expect_state(1, "2");
    fs::remove_all(SHARE + "/d");
    run("-i x -r daily");
    EXPECT_EQ(read_file(SHARE + "/d/file"), "precious");
    expect_state(1, "2");
    expect_state(1, "2", "rstate");
    EXPECT_TRUE(alerts().back().starts_with("1 2403 daily,,Public")) << alerts().back();
}

TEST_F(RemoteSide, FailuresAreAlertsAndFailedJobs)
{
    const Keys ssh{{"use_ssh", "1"}, {"rsync_mode", "1"}, {"remote_path", "/remote/data"}};
    Keys wrong_login = ssh;
    wrong_login["ssh_pwd"] = "wrong";
    const std::string denied = "--->[root@127.0.0.1: Permission denied (publickey,password).]";
    const std::vector<std::pair<Keys, std::string>> cases = {
        {{{"rsync_pwd", "wrong"}}, "--->[@ERROR: auth failed on module backup]"},
        {{{"remote_path", "nosuch"}}, "--->[@ERROR: Unknown module 'nosuch']"},
        {{{"remote_path", "archive"}}, "--->[ERROR: module is read only]"},
        {{{"remote_ip", "nosuch.invalid"}}, "--->["},
        {{{"backup_type", "2"}, {"remote_path", "data/missing"}}, "No such file or directory (2)]"},
        {wrong_login, denied},
        {ssh, denied}};
    for (const auto &[keys, said] : cases) {
        SetUp();
        add_job(keys);
        run("-r daily");
        expect_state(1, "4");
        EXPECT_EQ(alerts().size(), 1U);
        EXPECT_TRUE(has(trace_, said));
    }
}

TEST_F(RemoteSide, AChangedHostKeyIsRepaired)
{
    add_job({{"use_ssh", "1"}, {"rsync_mode", "1"}, {"remote_path", "/remote/data"}, {"ssh_pwd", "rootpw"}});
    fs::create_directories("/remote/data/S1_remote_backup/daily");
    shell("mkdir -p ~root/.ssh && ssh-keygen -q -t ed25519 -N '' -f /tmp/other && "
          "echo 127.0.0.1 $(cat /tmp/other.pub) >~root/.ssh/known_hosts");
    run("-r daily");
    expect_state(1, "2");
    EXPECT_TRUE(has(trace_, "--->##### SERVER SSH key changed!"));
}

TEST_F(RemoteSide, KillEndsARunAndItsTransfersButNoOther)
{
    const std::string killed = "it's $x (1)";
    const std::string quoted = "\"it's \\$x (1)\"";
    // The first is still on its way when the kill comes, slowed down as it is below.
    for (const auto &[name, size] :
         std::map<std::string, std::size_t>{{killed, 2'000'000}, {"other", 200'000}}) {
        add_job({{"job_name", name},
                 {"ssh_pwd", SSH_PASSWORD},
                 {"keep_exist_file", "2"}, // a restore of one folder would delete the other
                 {"local_path", SHARE + "/" + name}});
        write_file(SHARE + "/" + name + "/big", std::string(size, 'x'));
        fs::create_directories("/remote/backup/S1_remote_backup/" + name + "/Public");
    }
    const auto in_background = [](const std::string &arguments) {
        shell("/usr/sbin/bakjob " + arguments + " >/dev/null 2>&1 &");
    };
    const auto transferring = [](const std::string &name) {
        return shell("ps | grep -F '/usr/sbin/rsync --job-name=" + name +
                     "' | grep -F -- '--bwlimit' | grep -v grep")
                   .status == 0;
    };
    run("-r " + quoted); // so that there is something to restore
    for (const bool restore : {false, true}) {
        // Of another size, as it may be of the same second.
        write_file(SHARE + "/" + killed + "/big", std::string(restore ? 2'000'002 : 2'000'001, 'y'));
        const Fake slow(RSYNC, KIND_OF_CALL + "[ $kind != run ] || set -- --bwlimit=100 \"$@\"\n"
                                              "exec /usr/sbin/rsync.real \"$@\"\n");
        in_background((restore ? "-i x -r " : "-r ") + quoted);
        in_background("-r other");
        ASSERT_TRUE(eventually([&] { return transferring("it") && transferring("other"); }));
        EXPECT_EQ(bakjob_program("-d -r other").status, 255) << "a second run of a running job";
        EXPECT_EQ(bakjob_program("-k " + quoted).output, "kill rsync job success .....\n");
        EXPECT_TRUE(eventually([&] { return !transferring("it"); }, 5));
        EXPECT_NE(shell("ps | grep -F \"bakjob \" | grep -F \"it's\" | grep -v grep").status, 0);
        EXPECT_EQ(job_key(1, "state") + " " + job_key(1, "rstate"), restore ? "11 11" : "11 0");
        EXPECT_FALSE(exists("/var/run/bakjob_" + killed + ".pid"));
        EXPECT_FALSE(exists("/tmp/rsync_bakcup_src_folder_name." + killed));
        EXPECT_TRUE(eventually(
            [&] { return job_key(2, "state") == "2" && !exists("/var/run/bakjob_other.pid"); }, 20))
            << "the other job goes on";
        fs::remove_all("/remote/backup/S1_remote_backup/other/Public/other");
    }
    run("-r " + quoted);
    expect_state(1, "2");
}
