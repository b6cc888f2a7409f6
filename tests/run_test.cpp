// Runs of the program with a script in the place of rsync, which records what it was called for and ends as
// told: the order of steps, retries, states, alerts and refusals.

#include "cli/run_job.h"
#include "common/run_options.h"
#include "common/text.h"
#include "config/current_job.h"
#include "support.h"
#include "transfer/backup.h"

#include <algorithm>
#include <filesystem>
#include <unistd.h>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

// The n-th call of a kind prints line n of /tmp/KIND.reply and ends with line n of /tmp/KIND.code, or 0.
const std::string FAKE_RSYNC = KIND_OF_CALL + "echo $kind >>/tmp/calls; echo \"$*\" >>/tmp/arguments\n"
                                              "n=$(grep -c $kind /tmp/calls)\n"
                                              "sed -n ${n}p /tmp/$kind.reply 2>/dev/null\n"
                                              "code=$(sed -n ${n}p /tmp/$kind.code 2>/dev/null)\n"
                                              "[ \"$code\" = KILL ] && kill -9 $$\n"
                                              "exit ${code:-0}\n";

} // namespace

class Run : public ApplianceWithShare
{
protected:
    void SetUp() override
    {
        ApplianceWithShare::SetUp();
        store_set("/system_mgr/samba/netbios_name", "NAS");
        store_save();
    }

    static void expect_calls(const std::string &calls, const std::string &about = "")
    {
        std::string made = read_file("/tmp/calls");
        std::replace(made.begin(), made.end(), '\n', ' ');
        EXPECT_EQ(made, calls) << about;
    }

    // One folder's transfer, as far as the module is called.
    static BackupResult back_up(RsyncJob job)
    {
        copy_text(job.local_path, SHARE);
        for (const char *file : {"/tmp/calls", "/tmp/arguments"})
            unlink(file);
        return rsync_run_backup(named("daily"), job);
    }

    Fake rsync_{RSYNC, FAKE_RSYNC};
};

TEST_F(Run, RetriesAreCounted)
{
    struct Case {
        int retry;
        std::string dry;
        std::string run;
        BackupResult result;
        std::string calls;
    };
    const std::vector<Case> cases = {
        {0, "", "", BACKUP_DONE, "dry run "},
        {0, "", "11\n", BACKUP_FAILED, "dry run "},
        {1, "", "11\n", BACKUP_FAILED, "dry run "},
        {3, "", "11\n12\n13\n14\n", BACKUP_FAILED, "dry run dry run dry run "},
        {3, "", "11\n0\n", BACKUP_DONE, "dry run dry run "},
        {3, "", "23\n", BACKUP_FAILED, "dry run "},
        {3, "23\n", "0\n", BACKUP_DONE, "dry run "},
        {3, "10\n10\n10\n10\n", "", BACKUP_FAILED, "dry dry dry "},
        {0, "10\n", "", BACKUP_FAILED, "dry "},
        {2, "10\n0\n", "0\n", BACKUP_DONE, "dry dry run "},
        {2, "", "KILL\n0\n", BACKUP_DONE, "dry run dry run "},
        {1, "", "KILL\n", BACKUP_FAILED, "dry run "},
        {2, "KILL\n", "", BACKUP_DONE, "dry dry run "},
    };
    add_job({});
    for (const Case &one : cases) {
        write_file("/tmp/dry.code", one.dry);
        write_file("/tmp/run.code", one.run);
        write_file("/tmp/r_daily.dump_size", "old");
        RsyncJob job = make_job("daily");
        job.retry = one.retry;
        job.retry_interval = 0;
        EXPECT_EQ(back_up(job), one.result) << one.calls;
        expect_calls("list write " + one.calls);
        const bool dry_failed = !one.dry.empty() && !one.dry.starts_with("23");
        EXPECT_EQ(exists("/tmp/r_daily.dump_size"), !dry_failed) << one.calls;
    }
    RsyncJob job = make_job("daily");
    job.retry = 2;
    job.retry_interval = 1;
    write_file("/tmp/run.code", "11\n12\n");
    const auto start = std::time(nullptr);
    back_up(job);
    EXPECT_GE(std::time(nullptr) - start, 1) << "one wait between two transfers";
}

TEST_F(Run, ProbesDecideWhetherATransferStarts)
{
    struct Case {
        std::string list;
        std::string write;
        int backup_type;
        int rsync_mode;
        std::string remote_path;
        int recover;
        BackupResult result;
        std::string calls;
    };
    const std::string missing = "rsync: No such file or directory\n";
    const std::string denied = "@ERROR: auth failed on module x\n";
    const std::vector<Case> cases = {
        {"Connection refused\n", "", 1, 2, "m/p", 0, BACKUP_REMOTE_FAILED, "list "},
        {"", denied, 1, 2, "m/p", 0, BACKUP_DONE, "list write dry run "},
        {"", missing, 2, 2, "m/p", 0, BACKUP_REMOTE_FAILED, "list write "},
        {"", missing, 1, 2, "m", 0, BACKUP_DONE, "list write dry run "},
        {"", missing, 1, 1, "/m/p", 0, BACKUP_DONE, "list write dry run "},
        {"", missing + "\n", 1, 2, "m/p", 0, BACKUP_DONE, "list write write dry run "},
        {"", missing + missing, 1, 2, "m/p", 0, BACKUP_REMOTE_FAILED, "list write write "},
        {"Connection refused\n", "", 1, 2, "m/p", 2, BACKUP_DONE, "write dry run "},
        {"", denied, 2, 2, "m/p", 2, BACKUP_RECOVER_FAILED, "write "},
        {"", missing, 2, 2, "m/p", 2, BACKUP_RECOVER_FAILED, "write "},
    };
    add_job({});
    for (const Case &one : cases) {
        write_file("/tmp/list.reply", one.list);
        write_file("/tmp/write.reply", one.write);
        run_options.recover_seq = one.recover;
        RsyncJob job = make_job("daily");
        copy_text(job.remote_ip, "127.0.0.1");
        copy_text(job.remote_path, one.remote_path);
        job.backup_type = one.backup_type;
        job.rsync_mode = one.rsync_mode;
        const std::string before = job_key(1, "state");
        EXPECT_EQ(back_up(job), one.result) << one.calls;
        expect_calls(one.calls, one.write);
        const std::string running = one.recover != 0 ? "10" : "3";
        EXPECT_EQ(job_key(1, "state"), one.result == BACKUP_DONE ? running : before);
    }
}

TEST_F(Run, RefusedJobsRunNoTransfer)
{
    struct Case {
        std::function<void(RsyncJob &)> change;
        BackupResult result;
        std::string calls;
    };
    const std::string no_file = "/no/such/folder/file";
    const Fake ssh(SSH, "echo 'Permission denied'\n");
    add_job({});
    for (const Case &one : std::vector<Case>{
             {[](RsyncJob &job) { job.server_type = 3; }, BACKUP_FAILED, ""},
             {[](RsyncJob &job) { copy_text(job.remote_ip, "1;reboot"); }, BACKUP_REMOTE_FAILED, ""},
             {[](RsyncJob &job) { copy_text(job.remote_path, "m/\"x"); }, BACKUP_FAILED, "list "},
             {[&](RsyncJob &job) { copy_text(job.rsync_pwd_file, no_file); }, BACKUP_FAILED, ""},
             {[](RsyncJob &job) { job.use_ssh = 1; }, BACKUP_SSH_FAILED, ""}}) {
        RsyncJob job = make_job("daily");
        one.change(job);
        EXPECT_EQ(back_up(job), one.result);
        expect_calls(one.calls);
    }
    EXPECT_EQ(job_key(1, "state"), "0");
    RsyncJob job = make_job("daily");
    copy_text(job.rsync_pwd_file, no_file);
    job.rsync_mode = 1;
    EXPECT_EQ(back_up(job), BACKUP_DONE) << "a remote shell needs no password file";
}

TEST_F(Run, EachFolderRaisesItsAlertAndTheJobItsState)
{
    const std::string places = SHARE + "/a:" + SHARE + "/no:/elsewhere:" + SHARE + "/b c";
    add_job({{"local_path", places}});
    for (const char *folder : {"a", "b c"})
        fs::create_directories(SHARE + "/" + folder);
    write_file("/tmp/run.code", "0\n11\n0\n");
    EXPECT_EQ(bakjob_program("-r daily").status, 0);
    const std::string remote = "daily,NAS,backup/S1_remote_backup/daily/Public/";
    EXPECT_EQ(alerts(), (std::vector<std::string>{"1 2402 " + remote + "a", "1 1400 " + remote + "no",
                                                  "1 1400 daily,NAS,backup", "1 2402 " + remote + "b c"}));
    EXPECT_EQ(job_key(1, "state"), "4");
    EXPECT_EQ(read_file("/tmp/rsync_bakcup_src_folder_name.daily"), SHARE + "/b c\n4/4\n");
    EXPECT_FALSE(exists(PID_FILE));
    EXPECT_TRUE(has(read_file("/tmp/arguments"), "bk@127.0.0.1::backup/S1_remote_backup/daily/Public/b c"));
}

TEST_F(Run, TheFinalStateFollowsKindAndSchedule)
{
    const std::string many = "/mnt/HD/HD_a2/Public:/1:/2:/3:/4:/5:/6:/7:/8:/9:/10:/11";
    struct Case {
        std::string arguments;
        bool done;
        Keys keys;
        std::string states; // of backup and restore
        std::string last_alert;
    };
    const std::string name = "daily,NAS,";
    const std::string remote = name + "backup/S1_remote_backup/daily/Public";
    const std::string cut = name + std::string(500, 'x');
    const Keys scheduled{{"schedule_mode", "3"}};
    const Keys snapshots{{"backup_type", "2"}, {"inc_enable", "1"}};
    const std::vector<Case> cases = {
        {"-r daily", true, {}, "2 0", "1 2402 " + remote},
        {"-r daily", true, scheduled, "1 0", "1 2402 " + remote},
        {"-r daily", false, scheduled, "4 0", "1 1400 " + remote},
        {"-r daily", true, {{"local_path", ""}}, "2 0", ""},
        {"-r daily", true, {{"backup_type", "2"}}, "2 0", "1 2402 " + name + "Public"},
        {"-i x -r daily", true, {}, "0 2", "1 2403 " + name + "Public"},
        {"-i x -r daily", false, {}, "0 4", "1 1401 " + name + "Public"},
        {"-r daily", true, {{"local_path", "/short"}, {"backup_type", "2"}}, "4 0", "1 1400 " + name},
        {"-i x -r daily", true, {{"local_path", "/mnt/HD/HD_a2/Gone"}}, "0 4", "1 1401 " + name + "Gone"},
        {"-r daily", true, {{"local_path", many}}, "4 0", "1 1400 " + name + "backup"},
        {"-n 1 -r daily", true, snapshots, "2 0", "1 2402 " + name + "Public"},
        {"-n 1 -r daily", false, snapshots, "9 0", "1 1400 " + name + "Public"},
        {"-r daily", true, {{"remote_path", std::string(1000, 'x')}}, "4 0", "1 1400 " + cut}};
    for (const Case &one : cases) {
        SetUp();
        add_job(one.keys);
        fs::create_directories(SHARE + "/daily.0");
        write_file("/tmp/run.code", one.done ? "" : "11");
        EXPECT_EQ(bakjob_program(one.arguments).status, 0);
        EXPECT_EQ(job_key(1, "state") + " " + job_key(1, "rstate"), one.states)
            << one.arguments << " " << one.last_alert;
        EXPECT_EQ(alerts().empty() ? "" : alerts().back().substr(0, 508), one.last_alert.substr(0, 508));
    }
}

TEST_F(Run, RefusalsChangeNothing)
{
    struct Case {
        Keys keys;
        std::string arguments;
        int status;
        std::string trace;
    };
    std::vector<Case> cases = {
        {{{"enable", "0"}}, "-d -r daily", 255, "ERROR: not found this job_name [daily] or disabled\n"},
        {{{"job_name", "a/b"}}, "-d -r a/b", 255, "ERROR: not found this job_name [a/b] or disabled\n"},
        {{{"schedule_mode", "2"}, {"state", "2"}}, "-d -r daily", 255, ""},
        {{{"schedule_mode", "2"}, {"state", "2"}}, "-d -r daily -b", 255, ""},
        {{}, "-d -n 1 -r daily", 255, ""},
        {{{"inc_enable", "1"}, {"backup_type", "2"}}, "-d -n 1 -r daily", 255, ""},
        {{}, "-d -k a/b", 0, "ERROR: job name refused: [a/b]\n"},
        {{}, "-d -n 10 -n -3", 0, ""},
        {{}, "-d -p cGFrdG8= -p YWJj", 0, "encode_pwd = [pakto]\nencode_pwd = [abcto]\n"},
    };
    for (const std::string name : {"other", "../daily", ""})
        cases.push_back(
            {{}, "-d -r '" + name + "'", 255, "ERROR: not found this job_name [" + name + "] or disabled\n"});
    for (const std::string number : {"0 -r daily", "11", "abc", "4294967297", "-4294967295"})
        cases.push_back({{}, "-d -n " + number, 255, "ERROR: input error!\n"});
    for (const Case &one : cases) {
        SetUp();
        add_job(one.keys);
        const std::string before = read_file(STORE);
        const Ran ran = bakjob_program(one.arguments);
        EXPECT_EQ(ran.status, one.status) << one.arguments;
        EXPECT_EQ(ran.output, "OPEN DEBUG MODE!!\n" + one.trace) << one.arguments;
        EXPECT_EQ(read_file(STORE), before);
        expect_calls("");
        EXPECT_TRUE(alerts().empty());
    }
    SetUp();
    add_job({{"schedule_mode", "2"}, {"state", "2"}});
    EXPECT_EQ(bakjob_program("-b -r daily").status, 0);
    write_file(PID_FILE, "999999\n");
    EXPECT_EQ(bakjob_program("-d -r daily").output, "OPEN DEBUG MODE!!\nERROR: rsync backup is running!\n");
    EXPECT_EQ(read_file(PID_FILE), "999999\n");
    expect_calls("list write dry run ");
}

TEST_F(Run, OptionsActInTheirOrder)
{
    add_job({{"job_name", "a"}, {"local_path", "/gone"}});
    add_job({{"job_name", "b"}});
    const Ran usage = bakjob_program("-h");
    EXPECT_EQ(usage.status, 0);
    EXPECT_EQ(usage.output, "\nNAME\n\tbakjob - Run Rsync Backup\t[v1.00_20130904]\n\n"
                            "SYNOPSIS\n\tbakjob [-h] [-n seq] [-r job_name]\n\nDESCRIPTION\n\t-h\thelp\n"
                            "\t-b\tforce to run rsync backup (ignore state)\n"
                            "\t-n\tinput backup seq, and run rsync backup recover to remote\n"
                            "\t-r\tinput job name, and run rsync backup according to xml setting\n"
                            "\t-k\tinput job name, and kill rsync backup job\n");
    for (const char *wrong : {"-x", "-r", "-h -x", "-x -h"}) {
        EXPECT_EQ(bakjob_program(wrong).status, std::string(wrong).starts_with("-h") ? 0 : 255) << wrong;
        EXPECT_EQ(bakjob_program(wrong).output, usage.output) << wrong;
    }
    EXPECT_EQ(bakjob_program("").output, "");
    EXPECT_EQ(bakjob_program("-r b -d").output, "OPEN DEBUG MODE!!\n");
    EXPECT_EQ(job_key(2, "state"), "2");
    EXPECT_EQ(bakjob_program("-r a -r b").status, 0);
    EXPECT_EQ(job_key(1, "state") + job_key(2, "state"), "44") << "one failure counts for all that follows";
    EXPECT_EQ(bakjob_program("-i x -k b").output, "");
    EXPECT_EQ(job_key(2, "state") + job_key(2, "rstate"), "411");
    EXPECT_EQ(bakjob_program("-k b -r ''").status, 0) << "an empty name means the last one";
    EXPECT_EQ(job_key(2, "state"), "2");
}

TEST_F(Run, TracesItsCommands)
{
    add_job({{"backup_type", "2"}, {"inc_enable", "1"}});
    const auto trace = lines_of(bakjob_program("-d -r daily").output);
    const std::string command = trace.size() > 9 ? trace[9] : "";
    ASSERT_TRUE(command.starts_with("rsync_cmd = [/usr/sbin/rsync  --job-name=daily -aHq8 --delete"))
        << command;
    const std::string dry =
        command.substr(0, command.size() - 1) + " --dump-size  --dry-run >/dev/null 2>&1]";
    const std::string pull = "bk@127.0.0.1::backup/S1_remote_backup/daily/Public";
    EXPECT_EQ(trace,
              (std::vector<std::string>{"OPEN DEBUG MODE!!",
                                        "rysnc test cmd--->[/usr/sbin/rsync  -8 127.0.0.1:: 2>&1]", "--->[]",
                                        "rysnc write test cmd--->[/usr/sbin/rsync  -a8 --dry-run "
                                        "--password-file=\"/tmp/r_daily.passwd\" " +
                                            pull + " /tmp 2>&1]",
                                        "--->[]", "run rsync_snapshot_rotate() /mnt/HD/HD_a2/Public 3",
                                        "[/mnt/HD/HD_a2/Public/daily.2]", "[/mnt/HD/HD_a2/Public/daily.1]",
                                        "[/mnt/HD/HD_a2/Public/daily.0]", command, dry,
                                        "inc_root_path = [/mnt/HD/HD_a2/Public/daily.0]"}));
}
