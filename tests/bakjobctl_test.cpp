// bakjobctl as people and monitoring systems call it; see also the tests of its checks and its timetables.

#include "ctl_support.h"

#include <filesystem>

namespace fs = std::filesystem;

namespace
{

TEST_F(Ctl, AnAddedJobRunsAndNothingShowsItsPasswords)
{
    const std::string name = "\"it's 100% (1)\"";
    EXPECT_TRUE(says(ctl("status"), 3, "there are no jobs"));
    ASSERT_TRUE(says(add(name), 0, ""));
    EXPECT_EQ(job_key(1, "rsync_pwd"), "c2VjcmV0");
    EXPECT_EQ(job_key(1, "ssh_pwd"), "cm9vdHB3");
    EXPECT_EQ(read_file(FLASH), read_file(STORE));
    EXPECT_TRUE(says(ctl("check " + name + " --probe"), 0, ": 0 problems"));
    EXPECT_EQ(bakjob_program("-r " + name).status, 0);
    EXPECT_TRUE(says(ctl("status"), 0, "done"));

    for (const char *command :
         {"list", "list --json", "show", "show --json", "status --json", "check --json"}) {
        const bool of_all = std::string(command).starts_with("list");
        const Ran ran = ctl(command + (of_all ? "" : ' ' + name));
        EXPECT_TRUE(says(ran, 0, "")) << command;
        for (const char *secret : {"secret", "c2VjcmV0", "rootpw", "cm9vdHB3"})
            EXPECT_FALSE(has(ran.output, secret)) << command;
    }
}

TEST_F(CtlDaily, WhatIsNotAllowedIsNamedAndChangesNothing)
{
    const std::string before = read_file(STORE);
    const std::string long_text(200, 'x');
    const std::vector<std::pair<std::string, std::string>> refused = {
        {"set daily retry=16", "retry: \"16\" is not allowed; allowed: 0 to 15"},
        {"set daily retry=", "retry: \"\" is not allowed"},
        {"set daily retry=3x", "retry: \"3x\""},
        {"set daily retry=5 inc_number=2", "inc_number: \"2\" is not allowed; allowed: 3 to 10"},
        {"set daily backup_type=sideways", "allowed: 1 (push), 2 (pull)"},
        {"set daily port=65536", "port: \"65536\" is not allowed; allowed: 1 to 65535"},
        {"set daily remote_ip=", "remote_ip: \"\""},
        {"set daily 'remote_ip=a;reboot'", "remote_ip: \"a;reboot\""},
        {"set daily ssh_user=-oProxyCommand=x", "ssh_user"},
        {"set daily 'remote_path=a|b'", "remote_path: \"a|b\""},
        {"set daily local_path=Public", "local_path: \"Public\""},
        {"set daily local_path=/a/../b", "local_path"},
        {"set daily local_path=/a::/b", "local_path"},
        {"set daily local_path=/1:/2:/3:/4:/5:/6:/7:/8:/9:/10:/11", "up to 10 paths"},
        {"set daily user_description=" + long_text, "up to 127 bytes"},
        {"set daily user_description=\"$(printf 'a\\033b')\"", "control character"},
        {"set daily rsync_pwd=secret", "write rsync_pwd=-"},
        {"set daily rsync_pwd=- </dev/null", "daily: rsync_pwd: no password was given"},
        {"set daily rsync_pwd=- <<X\n" + long_text + "\nX\n", "up to 93 bytes"},
        {"set daily state=0", "state is bakjob's own"},
        {"set daily job_name=b", "job_name is bakjob's own"},
        {"set daily colour=red", "there is no key \"colour\""},
        {"set daily retry", "\"retry\" is not of the form key=value"},
        {"set daily", "nothing to set"},
        {"set other retry=1", "there is no job \"other\""},
        {"delete other", "there is no job \"other\""},
        {"add a/b remote_ip=h", "not allowed as a job's name"},
        {"add b remote_ip=h remote_path=m", "local_path is missing"},
        {"add daily remote_ip=h remote_path=m local_path=/l", "there is a job \"daily\" already"},
        {"snapshots daily", "the job keeps no snapshots"},
        {"unschedule daily", "the job has no timetable"},
        {"schedule daily '60 * * * *'", "minute: \"60\""},
        {"schedule daily '* * * *'", "weekday: \"\""},
        {"schedule daily '* * * * * *'", "five fields"},
        {"schedule daily '*/0 * * * *'", "minute"},
        {"schedule daily '5/2 * * * *'", "minute"},
        {"schedule daily '* 5-3 * * *'", "hour"},
        {"schedule daily '* * * * mon-xyz'", "weekday"},
        {"frobnicate daily", ""},
        {"", ""},
    };
    for (const auto &[arguments, message] : refused) {
        // A here-document ends the line that standard error must stand on.
        const Ran ran = shell("exec 2>&1; /usr/sbin/bakjobctl " + arguments);
        EXPECT_TRUE(says(ran, 3, message)) << arguments;
        EXPECT_EQ(read_file(STORE), before) << arguments;
    }
}

TEST_F(CtlDaily, ChangesMadeAtOnceAreAllKept)
{
    shell("for i in 1 2 3 4; do /usr/sbin/bakjobctl add j$i remote_ip=h remote_path=m local_path=/l & done; "
          "/usr/sbin/bakjobctl set daily retry=7 & /usr/sbin/bakjobctl disable daily & "
          "/usr/sbin/bakjobctl schedule daily '0 3 * * *' & /usr/sbin/bakjob -k daily & wait");
    EXPECT_EQ(lines_of(ctl("list --names").output).size(), 5U);
    EXPECT_EQ(job_key(1, "retry") + job_key(1, "enable") + job_key(1, "state"), "7011");
    EXPECT_EQ(read_file(CRON), "0 3 * * * root /usr/sbin/bakjob -r 'daily'\n");
}

TEST_F(Ctl, TheStatusIsWhatAMonitoringSystemNeeds)
{
    add_job({{"job_name", "idle"}});
    add_job({{"job_name", "done"}, {"state", "2"}, {"rstate", "4"}});
    add_job({{"job_name", "off"}, {"state", "4"}, {"enable", "0"}});
    EXPECT_EQ(ctl("status").status, 0);
    add_job({{"job_name", "busy"}, {"state", "3"}});
    shell("bash -c 'exec -a bakjob bash -c \"sleep 20; :\" -r busy' >/dev/null 2>&1 & "
          "echo $! >/var/run/bakjob_busy.pid");
    EXPECT_EQ(ctl("status").status, 2);
    EXPECT_EQ(ctl("status done").status, 0);
    for (const char *state : {"4", "8", "9", "11", "3", "77"}) {
        const std::string name = std::string("bad") + state;
        add_job({{"job_name", name}, {"state", state}});
        EXPECT_EQ(ctl("status " + name).status, 1) << state;
    }
    EXPECT_EQ(ctl("status").status, 1);
    EXPECT_TRUE(says(ctl("list --json"), 0, "\"last\": \"killed\""));
    EXPECT_TRUE(says(ctl("delete busy"), 3, "bakjob -k busy ends it"));
    shell("kill $(cat /var/run/bakjob_busy.pid)");
    EXPECT_EQ(ctl("status busy").status, 1);
    EXPECT_EQ(ctl("status nobody").status, 3);
    EXPECT_EQ(ctl("status ''").status, 3);
    write_file(STORE, "<config><backup_mgr>");
    EXPECT_EQ(ctl("status").status, 3) << "a damaged configuration is not fine";
}

TEST_F(CtlDaily, ARunIsFollowedToItsEnd)
{
    write_file(SHARE + "/film", std::string(1'000'000, 'x'));
    const Fake slow(RSYNC, KIND_OF_CALL +
                               "case $kind in list) sleep 0.5 ;; run) set -- --bwlimit=800 \"$@\" ;; esac\n"
                               "exec /usr/sbin/rsync.real \"$@\"\n");
    const auto beside = [](const std::string &run, const std::string &watch) {
        return shell(run + " & until [ -e " + PID_FILE + " ]; do sleep 0.01; done; " + watch +
                     "; status=$?; wait; exit $status");
    };
    const std::string watch = "/usr/sbin/bakjobctl watch daily";
    const Ran lines = beside("/usr/sbin/bakjob -r daily", watch);
    EXPECT_TRUE(says(lines, 0, "folder 1/1  /mnt/HD/HD_a2/Public  scanning\n"));
    EXPECT_TRUE(says(lines, 0, " bytes moved\n"));
    EXPECT_TRUE(says(lines, 0, "daily: done "));
    EXPECT_TRUE(says(ctl("watch daily --json"), 0, "\"last\":\"done\""));

    shell("rm -r /remote/backup/S1_remote_backup/daily/Public");
    const Ran drawn = beside("/usr/sbin/bakjob -r daily", "script -qec '" + watch + "' /dev/null");
    EXPECT_TRUE(says(drawn, 0, ".] folder 1/1  /mnt/HD/HD_a2/Public   "));
    shell("rm -r /remote/backup/S1_remote_backup/daily/Public");
    EXPECT_TRUE(says(beside("/usr/sbin/bakjob -i /mnt -r daily", watch), 1, "daily: restore failed"));
}

TEST_F(Ctl, SnapshotsAreNumberedAsARecoverRunTakesThem)
{
    ASSERT_TRUE(says(add("weekly", "backup_type=pull inc_enable=yes"), 0, ""));
    EXPECT_TRUE(says(ctl("snapshots weekly"), 0, "There are none yet"));
    for (const char *folder : {"weekly.1", "weekly.2", "weekly.old", "other.0"})
        fs::create_directories(SHARE + "/" + folder);
    shell("touch --date='2026-01-02 03:04:05' /mnt/HD/HD_a2/Public/weekly.2");
    const Ran ran = ctl("snapshots weekly");
    EXPECT_EQ(lines_of(ran.output).size(), 3U) << ran.output;
    EXPECT_TRUE(says(ran, 0, "3       2026-01-02 03:04:05  not known  /mnt/HD/HD_a2/Public/weekly.2"));
    EXPECT_FALSE(has(ran.output, "bakjob -n")) << "nothing is known of them";
    EXPECT_TRUE(says(ctl("check weekly"), 0, "not known to be complete: weekly.1, weekly.2"));
    for (int stray = 0; stray < 10; ++stray)
        fs::create_directories(SHARE + "/weekly.0" + std::to_string(stray));
    EXPECT_TRUE(says(ctl("snapshots weekly"), 0, SHARE + "/weekly.2")) << "hidden by no stray folder";
}

TEST_F(CtlDaily, TheRemoteSideIsShownWithItsSizes)
{
    write_file("/remote/data/f", std::string(3'000'000, 'x'));
    EXPECT_TRUE(says(ctl("remote daily"), 0, "data     /remote/data     2.9M"));
    ASSERT_EQ(shell("bash -c '/usr/sbin/bakjobctl set daily ssh_pwd=- <<<guess'").status, 0);
    EXPECT_TRUE(says(ctl("remote daily"), 0, "data     ?       ?"));
    ASSERT_TRUE(says(ctl("set daily remote_ip=no.such.host.invalid"), 0, ""));
    EXPECT_TRUE(says(ctl("remote daily"), 3, "cannot be asked: rsync: getaddrinfo"));
}

} // namespace
