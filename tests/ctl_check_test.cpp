// What a check finds before a run would meet it: here, and with a probe on the remote side.

#include "ctl_support.h"

#include <filesystem>

namespace fs = std::filesystem;

namespace
{

TEST_F(Ctl, ACheckFindsWhatARunWouldMeetHere)
{
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
        {{{"remote_path", std::string(1000, 'x')}}, "", 1, "remote_path refused: too long"},
        {{{"schedule_mode", "2"}, {"state", "2"}}, "", 1, "the job runs once, and has run"},
        {{{"state", "3"}}, "", 0, "bakjob -a clears that"},
        {{{"inc_enable", "1"}}, "", 0, "only a job that pulls keeps snapshots"},
        {{}, "true & echo $! >/var/run/bakjob_daily.pid", 1, "bakjob_daily.pid && bakjob -k daily"},
        {{}, "echo $PPID >/var/run/bakjob_daily.pid", 1, "run: one died"}, // another process has the number
        {{}, "printf 'S\\n1' >/tmp/kv_serial.txt", 1, "line break"},
        {{}, "chmod o+w /tmp/kv_serial.txt", 1, "problem  /tmp/kv_serial.txt: it is not a plain file"},
        {keys_of("inc_enable=1 backup_type=2"), "ln -s /etc daily.2", 1, "Public/daily.2: it is a link"},
        {{{"backup_type", "2"}}, "", 0, "note     /mnt/HD/HD_a2/Public: a run may bring setuid programs"},
        {{{"local_path", SHARE + "/link"}}, "ln -s /etc link", 0, "a run sends the link"},
        {{}, "mkdir /tmp/r_daily.passwd", 0, "0 problems"}, // a run removes it
        {{}, "mkdir -p /tmp/r_daily.passwd/x", 1, "problem  /tmp/r_daily.passwd: it is a folder"},
        {{}, "mkdir -p /tmp/remote_rshareinfo_daily.txt/x", 1, "rshareinfo_daily.txt: it is a folder"},
        {{}, "mv /usr/sbin/ssh-keygen /usr/sbin/ssh-keygen.away", 0, "note     /usr/sbin/ssh-keygen"},
    };
    for (const Case &c : cases) {
        SetUp();
        add_job(c.keys);
        shell("cd " + SHARE + " && " + (c.setup.empty() ? "true" : c.setup));
        EXPECT_TRUE(says(ctl("check daily"), c.status, c.found))
            << c.setup << (c.keys.empty() ? "" : c.keys.begin()->first);
        shell("[ ! -e /usr/sbin/ssh-keygen.away ] || mv /usr/sbin/ssh-keygen.away /usr/sbin/ssh-keygen");
    }

    SetUp();
    add_job({});
    set_schedule({"/usr/sbin/bakjob -r 'daily'"});
    store_set("/system_mgr/crond/rsync/item:1/minute", "99");
    store_save();
    EXPECT_TRUE(says(ctl("check daily"), 1, "problem  timetable: minute: \"99\""));
}

TEST_F(Ctl, AdviceIsQuotedForTheShell)
{
    for (const auto &[name, advice] :
         Keys{{"it's; touch HACK",
               "rm '/var/run/bakjob_it'\\''s; touch HACK.pid' && bakjob -k 'it'\\''s; touch HACK' "},
              {"NAME", "rm /var/run/bakjob_NAME.pid && bakjob -k NAME "},
              {"$(id)", "rm '/var/run/bakjob_$(id).pid' && bakjob -k '$(id)' "}}) {
        add_job({{"job_name", name}});
        write_file("/var/run/bakjob_" + name + ".pid", "2147483646\n");
        write_file("/tmp/name", name);
        EXPECT_TRUE(says(ctl("check -- \"$(cat /tmp/name)\""), 1, advice));
    }
}

const std::string TARGET = "/remote/backup/S1_remote_backup/daily";

class CtlProbe : public Ctl
{
protected:
    void SetUp() override
    {
        TearDown();
        Ctl::SetUp();
        ASSERT_TRUE(says(add("daily"), 0, ""));
    }

    void TearDown() override
    {
        shell("sed -i '/^motd file/d' /etc/rsyncd.conf; rm -f /etc/remote_motd");
        Ctl::TearDown();
    }

    // Each line is one of a greeting.
    static void greet(const std::string &text)
    {
        write_file("/etc/remote_motd", text);
        shell("sed -i '/^motd file/d; 1i motd file = /etc/remote_motd' /etc/rsyncd.conf");
    }
};

struct ProbeCase {
    std::string settings; // and more for the shell
    int status;
    std::string found;
};

void expect_probe(const ProbeCase &one)
{
    const std::string set = "/usr/sbin/bakjobctl set daily " + one.settings;
    ASSERT_EQ(one.settings.empty() ? 0 : shell("bash -c \"" + set + "\"").status, 0);
    EXPECT_TRUE(says(ctl("check daily --probe"), one.status, one.found)) << one.settings;
}

TEST_F(CtlProbe, SaysInWordsWhatTheRemoteSideRefuses)
{
    const std::string path_mode = "rsync_mode=path use_ssh=yes rsync_user=root remote_path=/remote/data ";
    const std::vector<ProbeCase> cases = {
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
        {"use_ssh=yes ssh_user=bk ssh_pwd=- <<<bkpw && mkdir -p /remote/backup/S1_remote_backup/daily", 1,
         "Public: "}, // that user's daemon has no such module
        {"remote_path=backup/ && mkdir -p /remote/backup/S1_remote_backup/daily/Public", 0,
         "lets the job in"},
        {path_mode + "&& mkdir -p /remote/data/S1_remote_backup/daily", 0, "Public: lets the job in"},
        {"remote_ip=no.such.host.invalid", 1, "problem  rsync daemon"},
        {"use_ssh=yes remote_ip=no.such.host.invalid", 1, "ssh login: fails"},
    };
    for (const ProbeCase &one : cases) {
        SetUp();
        expect_probe(one);
    }
    SetUp();
    ASSERT_TRUE(says(ctl("set daily use_ssh=yes"), 0, ""));
    shell("ssh-keygen -q -t ed25519 -N '' -f /tmp/key && (printf '127.0.0.1 '; cat /tmp/key.pub) "
          ">~root/.ssh/known_hosts");
    const std::string known = shell("cat ~root/.ssh/known_hosts").output;
    EXPECT_TRUE(says(ctl("check daily --probe"), 1, "meets another host key than before"));
    EXPECT_EQ(shell("cat ~root/.ssh/known_hosts").output, known) << "to be judged by a person";

    const Fake silent(RSYNC, "sleep 9");
    ASSERT_TRUE(says(ctl("set daily use_ssh=no"), 0, ""));
    shell("timeout --signal=INT 1 /usr/sbin/bakjobctl check daily --probe");
    EXPECT_EQ(shell("ls /tmp | grep -c passwd").output, "0\n") << "not even of a check that was interrupted";
}

TEST_F(CtlProbe, FindsTheReasonBehindTheGreeting)
{
    const std::string pull = "backup_type=pull remote_path=";
    const std::vector<ProbeCase> cases = {
        {"", 1, "is not there yet, and no run makes it, as the greeting hides that: \"Welcome"},
        {"retry=0 && mkdir -p " + TARGET, 0, "Public: lets the job in"},
        {"rsync_pwd=- <<<guess", 1, "does not take user and password: @ERROR: auth failed"},
        {"remote_path=nowhere/x", 1, "has no such module: @ERROR: Unknown module 'nowhere'"},
        {"remote_path=archive", 1, "has the module for reading only: ERROR: module is read only"},
        {pull + "data/none/x", 1, "is not there: rsync: [sender]"},
        {pull + "data && mkdir -p /remote/data/S1_remote_backup/daily/Public", 0, "Public: lets the job in"},
    };
    for (const ProbeCase &one : cases) {
        SetUp();
        greet("Welcome\nls: is what you type\nand Connection refused is what you see\n");
        expect_probe(one);
    }
}

// The verdict is the run's, with a greeting and without.
TEST_F(CtlProbe, PromisesWhatARunDoes)
{
    for (const auto &[greeting, there] : std::vector<std::pair<std::string, bool>>{{"Welcome\n", false},
                                                                                   {"Welcome\n", true},
                                                                                   {"Tools: none\n", true},
                                                                                   {"\nWelcome\n", false},
                                                                                   {"", false}}) {
        SetUp();
        if (!greeting.empty()) greet(greeting);
        if (there) fs::create_directories(TARGET);
        const Ran check = ctl("check daily --probe");
        bakjob_program("-r daily");
        EXPECT_EQ(ctl("status daily").status, check.status) << greeting << there << check.output;
        EXPECT_EQ(greeting == "Tools: none\n",
                  check.output.find("a run takes its greeting for a failure: Tools: none") !=
                      std::string::npos);
    }
}

} // namespace
