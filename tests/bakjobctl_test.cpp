// bakjobctl as people and monitoring systems call it.

#include "ctl_support.h"

#include <algorithm>
#include <csignal>
#include <filesystem>
#include <sys/mount.h>
#include <unistd.h>

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
        for (const char *secret : {"secret", "c2VjcmV0", "rootpw", "cm9vdHB3"}) {
            EXPECT_EQ(ran.output.find(secret), std::string::npos) << command;
        }
    }
}

TEST_F(Ctl, WhatIsNotAllowedIsNamedAndChangesNothing)
{
    ASSERT_TRUE(says(add("daily"), 0, ""));
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

TEST_F(Ctl, AChangeThatCannotBeKeptIsAFailure)
{
    ASSERT_TRUE(says(add("daily"), 0, ""));
    ASSERT_TRUE(says(ctl("schedule daily '0 3 * * *'"), 0, ""));
    const std::string before = read_file(STORE);
    const std::string cron = read_file(CRON);
    ASSERT_EQ(mount("/etc/NAS_CFG", "/etc/NAS_CFG", "", MS_BIND, nullptr), 0);
    ASSERT_EQ(mount(nullptr, "/etc/NAS_CFG", "", MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
    for (const char *command :
         {"set daily retry=1", "delete daily", "schedule daily '0 4 * * *'", "unschedule daily"}) {
        EXPECT_EQ(ctl(command).status, 3) << command;
        EXPECT_EQ(read_file(CRON), cron) << command;
    }
    umount2("/etc/NAS_CFG", MNT_DETACH);
    EXPECT_EQ(read_file(STORE), before);

    fs::remove_all("/var/lib/device_flash");
    write_file("/var/lib/device_flash", "no folder");
    EXPECT_TRUE(says(ctl("set daily retry=1"), 3, "could not be copied to flash"));
    fs::remove("/var/lib/device_flash");
}

TEST_F(Ctl, ChangesMadeAtOnceAreAllKept)
{
    ASSERT_TRUE(says(add("daily"), 0, ""));
    shell("for i in 1 2 3 4; do /usr/sbin/bakjobctl add j$i remote_ip=h remote_path=m local_path=/l & done; "
          "/usr/sbin/bakjobctl set daily retry=7 & /usr/sbin/bakjobctl disable daily & "
          "/usr/sbin/bakjobctl schedule daily '0 3 * * *' & /usr/sbin/bakjob -k daily & wait");
    EXPECT_EQ(lines_of(ctl("list --names").output).size(), 5U);
    EXPECT_EQ(job_key(1, "retry") + job_key(1, "enable") + job_key(1, "state"), "7011");
    EXPECT_NE(read_file(CRON).find("0 3 * * * root /usr/sbin/bakjob -r 'daily'\n"), std::string::npos);
}

TEST_F(Ctl, AJobHasOneTimetableAndKeepsItToItself)
{
    for (const char *name : {"s", "\"it's 100%\"", "ss"}) {
        ASSERT_TRUE(says(add(name), 0, ""));
        ASSERT_TRUE(says(ctl("schedule " + std::string(name) + " '1 2 * * *'"), 0, ""));
    }
    ASSERT_TRUE(says(ctl("schedule s '*/5 0-6/2,23 1 JAN,7 mon-5'"), 0, ""));
    const std::string of_others = "1 2 * * * root /usr/sbin/bakjob -r 'it'\\''s 100\\%' # 'it's 100\\%'\n"
                                  "1 2 * * * root /usr/sbin/bakjob -r 'ss'\n";
    EXPECT_EQ(read_file(CRON), of_others + "*/5 0-6/2,23 1 JAN,7 mon-5 root /usr/sbin/bakjob -r 's'\n");
    EXPECT_TRUE(says(ctl("show s"), 0, "timetable             */5 0-6/2,23 1 JAN,7 mon-5"));

    ASSERT_TRUE(says(ctl("unschedule s"), 0, ""));
    EXPECT_EQ(read_file(CRON), of_others);
    ASSERT_TRUE(says(ctl("set s schedule_mode=once"), 0, ""));
    EXPECT_EQ(read_file(CRON), of_others);
    ASSERT_TRUE(says(add("it"), 0, ""));
    ASSERT_TRUE(says(ctl("delete ss"), 0, ""));
    ASSERT_TRUE(says(ctl("delete \"it's 100%\""), 0, ""));
    EXPECT_EQ(read_file(CRON), "");
    EXPECT_EQ(ctl("list --names").output, "s\nit\n");
}

TEST_F(Ctl, ACheckFindsWhatARunWouldMeetHere)
{
    ASSERT_TRUE(says(add("daily"), 0, ""));
    struct Case {
        Keys keys;
        std::string setup; // for the shell
        int status;
        std::string found;
    };
    const std::string long_folder = "/mnt/HD/HD_a2/Public/" + std::string(300, 'x');
    const std::vector<Case> cases = {
        {{}, "", 0, "note     timetable: there is none"},
        {{{"enable", "0"}}, "", 1, "problem  enable: the job is switched off"},
        {{{"server_type", "3"}}, "", 1, "problem  server_type: \"3\" is not allowed"},
        {{{"remote_ip", "a b"}}, "", 1, "problem  remote_ip"},
        {{{"remote_path", std::string(1100, 'x')}}, "", 1, "problem  remote_path"},
        {{{"remote_path", "/backup"}}, "", 1, "remote_path: it begins with a slash"},
        {{{"port", "873 "}}, "", 0, "0 problems"},
        {{{"rsync_user", ""}}, "", 0, "note     rsync_user"},
        {{{"server_type", "1"}}, "", 0, "note     rsync_user: a run looks by it for missing folders"},
        {{{"inc_enable", "1"}, {"inc_number", "0"}, {"backup_type", "2"}}, "", 0, "note     inc_number"},
        {{{"local_path", "/mnt/HD/HD_a2/Public::"}}, "", 0, "0 problems"},
        {{{"port", "8730"}}, "", 0, "note     port"},
        {{{"rsync_user", ""}, {"server_type", "1"}}, "", 0, "0 problems"},
        {{{"rsync_pwd_file", "/tmp/other"}}, "", 1, "problem  rsync_pwd_file"},
        {{{"ssh_pwd", "rootpw!"}}, "", 1, "problem  ssh_pwd: it is not kept in base64"},
        {{{"pwd_encoded", "0"}, {"rsync_pwd", std::string(100, 'x')}}, "", 1, "problem  rsync_pwd"},
        {{{"local_path", "/mnt/HD/HD_a2/Public/none"}}, "", 1, "Public/none: No such file"},
        {{{"local_path", "/mnt/HD/HD_a2/None"}}, "", 1, "/mnt/HD/HD_a2/None: no share holds it"},
        {{{"local_path", long_folder}}, "", 1, "problem  local_path"},
        {{{"local_path", "/mnt/HD/HD_a2/Public"}}, "rm -r /mnt/HD/HD_a2/Public", 1, "cannot be entered"},
        {{{"remote_path", std::string(1000, 'x')}}, "", 1, "its transfer's command is refused"},
        {{{"schedule_mode", "2"}, {"state", "2"}}, "", 1, "the job runs once, and has run"},
        {{{"state", "3"}}, "", 0, "bakjob -a clears that"},
        {{{"inc_enable", "1"}}, "", 0, "only a job that pulls keeps snapshots"},
        {{},
         "true & echo $! >/var/run/bakjob_daily.pid",
         1,
         "rm /var/run/bakjob_daily.pid && bakjob -k daily"},
        {{}, "echo $PPID >/var/run/bakjob_daily.pid", 1, "run: one died"}, // another process has the number
        {{}, "printf 'S\\n1' >/tmp/kv_serial.txt", 1, "line break"},
        {{}, "chmod o+w /tmp/kv_serial.txt", 1, "problem  /tmp/kv_serial.txt: it is not a plain file"},
        {{{"inc_enable", "1"}, {"backup_type", "2"}},
         "ln -s /etc /mnt/HD/HD_a2/Public/daily.2",
         1,
         "problem  /mnt/HD/HD_a2/Public/daily.2: it is a link"},
        {{{"backup_type", "2"}}, "", 0, "note     /mnt/HD/HD_a2/Public: a run may bring setuid programs"},
        {{{"local_path", "/mnt/HD/HD_a2/Public/link"}},
         "ln -s /etc /mnt/HD/HD_a2/Public/link",
         0,
         "a run sends the link"},
        {{}, "mv /usr/sbin/ssh-keygen /usr/sbin/ssh-keygen.away", 0, "note     /usr/sbin/ssh-keygen"},
    };
    for (const Case &c : cases) {
        SetUp();
        add_job(c.keys);
        shell(c.setup);
        EXPECT_TRUE(says(ctl("check daily"), c.status, c.found))
            << c.setup << (c.keys.empty() ? "" : c.keys.begin()->first);
        shell("[ ! -e /usr/sbin/ssh-keygen.away ] || mv /usr/sbin/ssh-keygen.away /usr/sbin/ssh-keygen");
    }

    SetUp();
    add_job({});
    store_set("/system_mgr/crond/list/count", "1");
    store_set("/system_mgr/crond/list/name:1", "rsync");
    store_set("/system_mgr/crond/rsync/count", "1");
    store_set("/system_mgr/crond/rsync/item:1/minute", "99");
    store_set("/system_mgr/crond/rsync/item:1/run", "/usr/sbin/bakjob -r 'daily'");
    store_save();
    EXPECT_TRUE(says(ctl("check daily"), 1, "problem  timetable: minute: \"99\""));
}

TEST_F(Ctl, AProbeSaysInWordsWhatTheRemoteSideRefuses)
{
    ASSERT_TRUE(says(add("daily"), 0, ""));
    struct Case {
        std::string settings;
        int status;
        std::string found;
    };
    const std::string path_mode = "rsync_mode=path use_ssh=yes rsync_user=root remote_path=/remote/data ";
    const std::vector<Case> cases = {
        {"", 0, "Public: is not there yet; the run makes it"},
        {"rsync_pwd=- <<<guess", 1, "does not take user and password: @ERROR: auth failed"},
        {"remote_path=nowhere/x", 1, "has no such module"},
        {"remote_path=backup/x", 1, "only where remote_path is a module alone"},
        {"remote_path=archive", 1, "has the module for reading only"},
        {"backup_type=pull", 1, "Public: is not there"},
        {"ssh_pwd=- <<<guess", 1, "the ssh login by which a run makes it is denied"},
        {"use_ssh=yes ssh_pwd=- <<<guess", 1, "ssh login: is denied"},
        {"use_ssh=yes", 0, "ssh login: is let in"},
        {path_mode, 1, "Public: does not have the folder"},
        {"port=8730", 1, "port 8730: refuses the connection"},
        {"use_ssh=yes ssh_user=bk ssh_pwd=- <<<bkpw && mkdir -p /remote/backup/S123_remote_backup/daily", 1,
         "Public: "}, // that user's daemon has no such module
        {"remote_path=backup/ && mkdir -p /remote/backup/S123_remote_backup/daily/Public", 0,
         "lets the job in"},
        {path_mode + "&& mkdir -p /remote/data/S123_remote_backup/daily", 0, "Public: lets the job in"},
        {"remote_ip=no.such.host.invalid", 1, "problem  rsync daemon"},
        {"use_ssh=yes remote_ip=no.such.host.invalid", 1, "ssh login: fails"},
    };
    for (const Case &c : cases) {
        SetUp();
        ASSERT_TRUE(says(add("daily"), 0, ""));
        if (!c.settings.empty()) {
            ASSERT_EQ(shell("bash -c \"/usr/sbin/bakjobctl set daily " + c.settings + "\"").status, 0);
        }
        EXPECT_TRUE(says(ctl("check daily --probe"), c.status, c.found)) << c.settings;
    }
    SetUp();
    ASSERT_TRUE(says(add("daily", "use_ssh=yes"), 0, ""));
    shell("ssh-keygen -q -t ed25519 -N '' -f /tmp/key && (printf '127.0.0.1 '; cat /tmp/key.pub) "
          ">~root/.ssh/known_hosts");
    const std::string known = shell("cat ~root/.ssh/known_hosts").output;
    EXPECT_TRUE(says(ctl("check daily --probe"), 1, "meets another host key than before"));
    EXPECT_EQ(shell("cat ~root/.ssh/known_hosts").output, known) << "to be judged by a person";

    const Fake silent("/usr/sbin/rsync", "sleep 9");
    ASSERT_TRUE(says(ctl("set daily use_ssh=no"), 0, ""));
    shell("timeout --signal=INT 1 /usr/sbin/bakjobctl check daily --probe");
    EXPECT_EQ(shell("ls /tmp | grep -c passwd").output, "0\n") << "not even of a check that was interrupted";
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

TEST_F(Ctl, ARunIsFollowedToItsEnd)
{
    ASSERT_TRUE(says(add("daily"), 0, ""));
    write_file("/mnt/HD/HD_a2/Public/film", std::string(1'500'000, 'x'));
    const Fake slow("/usr/sbin/rsync", "case \"$*\" in --server* | *--dry-run*) ;; *::) sleep 2 ;; "
                                       "*) set -- --bwlimit=1000 \"$@\" ;; esac\n"
                                       "exec /usr/sbin/rsync.real \"$@\"\n");
    const Ran lines = shell("/usr/sbin/bakjob -r daily & /usr/sbin/bakjobctl watch daily; wait");
    EXPECT_TRUE(says(lines, 0, "folder 1/1  /mnt/HD/HD_a2/Public  looking what there is to do\n"));
    EXPECT_TRUE(says(lines, 0, " bytes moved\n"));
    EXPECT_TRUE(says(lines, 0, "daily: done "));
    EXPECT_TRUE(says(ctl("watch daily --json"), 0, "\"last\":\"done\""));

    shell("rm -r /remote/backup/S123*");
    const Ran drawn =
        shell("/usr/sbin/bakjob -r daily & script -qec '/usr/sbin/bakjobctl watch daily' /dev/null; wait");
    EXPECT_TRUE(says(drawn, 0, ".] folder 1/1  /mnt/HD/HD_a2/Public   66 %  1"));
    shell("rm -r /remote/backup/S123*/daily/Public");
    const Ran restore = shell("/usr/sbin/bakjob -i /mnt -r daily & "
                              "until [ -e /var/run/bakjob_daily.pid ]; do sleep 0.01; done; "
                              "/usr/sbin/bakjobctl watch daily; "
                              "status=$?; wait; exit $status");
    EXPECT_TRUE(says(restore, 1, "daily: restore failed"));
}

TEST_F(Ctl, SnapshotsAreNumberedAsARecoverRunTakesThem)
{
    ASSERT_TRUE(says(add("weekly", "backup_type=pull inc_enable=yes"), 0, ""));
    EXPECT_TRUE(says(ctl("snapshots weekly"), 0, "There are none yet"));
    for (const char *folder : {"weekly.1", "weekly.2", "weekly.old", "other.0"}) {
        fs::create_directories(std::string("/mnt/HD/HD_a2/Public/") + folder);
    }
    shell("touch --date='2026-01-02 03:04:05' /mnt/HD/HD_a2/Public/weekly.2");
    const Ran ran = ctl("snapshots weekly");
    EXPECT_EQ(lines_of(ran.output).size(), 3U) << ran.output;
    EXPECT_TRUE(says(ran, 0, "3       2026-01-02 03:04:05  not known  /mnt/HD/HD_a2/Public/weekly.2"));
    EXPECT_EQ(ran.output.find("bakjob -n"), std::string::npos) << "nothing is known of them";
    EXPECT_TRUE(says(ctl("check weekly"), 0, "not known to be complete: weekly.1, weekly.2"));
}

TEST_F(Ctl, TheRemoteSideIsShownWithItsSizes)
{
    ASSERT_TRUE(says(add("daily"), 0, ""));
    write_file("/remote/data/f", std::string(3'000'000, 'x'));
    EXPECT_TRUE(says(ctl("remote daily"), 0, "data     /remote/data     2.9M"));
    ASSERT_EQ(shell("bash -c '/usr/sbin/bakjobctl set daily ssh_pwd=- <<<guess'").status, 0);
    EXPECT_TRUE(says(ctl("remote daily"), 0, "data     ?       ?"));
    ASSERT_TRUE(says(ctl("set daily remote_ip=no.such.host.invalid"), 0, ""));
    EXPECT_TRUE(says(ctl("remote daily"), 3, "cannot be asked: rsync: getaddrinfo"));
}

} // namespace
