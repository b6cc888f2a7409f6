#include "common/run_options.h"
#include "common/text.h"
#include "config/current_job.h"
#include "platform/config_store.h"
#include "support.h"
#include "transfer/backup.h"
#include "transfer/rsync_command.h"

#include <filesystem>

using namespace bakjob;

namespace
{

constexpr const char *EXCLUDED =
    "--exclude '.AppleDouble' --exclude '.AppleDB'  --exclude '.DS_Store' --exclude '.bin' --exclude "
    "'.AppleDesktop'  --exclude 'Network Trash Folder' --exclude '.!@#$recycle'  --exclude 'lost+found' "
    "--exclude "
    "'Nas_Prog' --exclude 'Ajaxpf'  --exclude '.systemfile' --exclude 'P2P' --exclude 'aMule' --exclude "
    "'.!@$mmc' --exclude '.!@#$tarnelSync' --exclude '.zorv'";

std::string build(RsyncJob job)
{
    rsync_prepare_current_job(job);
    return rsync_build_command(job).value_or("(refused)");
}

} // namespace

class Command : public Appliance
{
protected:
    void SetUp() override
    {
        Appliance::SetUp();
        std::filesystem::remove_all("/srv/share1");
        std::filesystem::create_directories("/srv/share1");
    }
};

TEST_F(Command, OfWholeJobsIsExact)
{
    RsyncJob job = make_job("daily");
    EXPECT_EQ(build(job), std::string("/usr/sbin/rsync  --job-name=daily -aHq8 --delete --timeout=600  ") +
                              EXCLUDED +
                              "  --password-file=\"/tmp/r_daily.passwd\" /srv/share1/ "
                              "bk@192.168.1.20::backup/share1 ");

    RsyncJob weekly = make_job("weekly");
    weekly.backup_type = 2;
    weekly.inc_enable = 1;
    copy_text(weekly.remote_ip, "fe80::211:32ff:fe01:2");
    EXPECT_EQ(
        build(weekly),
        std::string("/usr/sbin/rsync  --job-name=weekly -aHq86 --delete --timeout=600  ") + EXCLUDED +
            "  --password-file=\"/tmp/r_weekly.passwd\" bk@[fe80::211:32ff:fe01:2%egiga0]::backup/share1/ "
            "/srv/share1/weekly.0 ");

    RsyncJob ssh = make_job("daily");
    ssh.rsync_mode = ssh.use_ssh = ssh.server_type = 1;
    ssh.rsync_timeout = 0;
    ssh.keep_exist_file = 2;
    copy_text(ssh.remote_path, "/volume/bk");
    std::filesystem::remove("/srv/share1");
    EXPECT_EQ(build(ssh),
              std::string("/usr/sbin/rsync  --job-name=daily -aHq8 -e '/usr/sbin/ssh  -ax -c blowfish '  ") +
                  EXCLUDED + "  /srv/share1 192.168.1.20:/volume/bk ");

    RsyncJob recover = make_job("daily");
    recover.backup_type = 2;
    recover.inc_enable = 1;
    run_options.recover_seq = 3;
    EXPECT_TRUE(build(recover).ends_with("\" /srv/share1/daily.2/ bk@192.168.1.20::backup/share1 "))
        << build(recover);
    recover.job_name[0] = '\0';
    EXPECT_TRUE(build(recover).ends_with(" /srv/share1/backup.2/ bk@192.168.1.20::backup/share1 "));
}

TEST_F(Command, EndpointsFollowModeServerAndAddress)
{
    struct Case {
        int mode;
        int server;
        const char *ip;
        std::string endpoint;
    };
    const std::vector<Case> cases = {
        {2, 1, "10.0.0.1", "root@10.0.0.1::"},
        {2, 1, "fe80::1", "root@[fe80::1%egiga0]::"},
        {2, 1, "2001:db8::1", "root@[2001:db8::1]::"},
        {2, 2, "nas", "bk@nas::"},
        {2, 2, "fe80::1", "bk@[fe80::1%egiga0]::"},
        {2, 2, "::1", "bk@[::1]::"},
        {1, 2, "10.0.0.1", "10.0.0.1:"},
        {0, 1, "::1", "[::1]:"},
        {1, 1, "FE80::1", "[FE80::1%egiga0]:"},
    };
    for (const Case &one : cases) {
        for (const int backup_type : {1, 2, 0}) {
            RsyncJob job = make_job("j");
            job.rsync_mode = one.mode;
            job.server_type = one.server;
            job.backup_type = backup_type;
            copy_text(job.remote_ip, one.ip);
            copy_text(job.remote_path, "m/a b");
            const std::string local = "/srv/share1/ ";
            const std::string remote = one.endpoint + "m/a\\ b";
            const std::string command = build(job);
            EXPECT_TRUE(command.ends_with(backup_type == 1 ? " " + local + remote + " "
                                                           : " " + remote + "/ " + local))
                << command;
            EXPECT_TRUE(has(command, one.endpoint.find('[') == std::string::npos ? " -aHq8 " : " -aHq86 "));
        }
    }
}

TEST_F(Command, SettingsSelectTheirPieces)
{
    RsyncJob job = make_job("j");
    job.use_ssh = 1;
    copy_text(job.ssh_pwd, "c3No");
    copy_text(job.ssh_user, "me");
    EXPECT_TRUE(has(build(job), "j -aHq8 -e '/usr/sbin/ssh -d \"c3No\" -ax -c blowfish -l me' --delete"));
    job.server_type = 1;
    EXPECT_TRUE(has(build(job), "j -aHq8 -e '/usr/sbin/ssh -d \"c3No\"  -ax -c blowfish ' --delete"));
    job.server_type = 2;
    job.ssh_pwd[0] = '\0';
    EXPECT_TRUE(has(build(job), "j -aHq8 -e '/usr/sbin/ssh -ax -c blowfish -l me' --delete"));
    job.use_ssh = 0;
    for (const auto &[value, text] : std::map<int, std::string>{{0, "-aHq8 --delete --timeout"},
                                                                {1, "-aHq8 --ignore-existing --timeout"},
                                                                {2, "-aHq8  --timeout"},
                                                                {3, "-aHq8 --delete --timeout"}}) {
        job.keep_exist_file = value;
        EXPECT_TRUE(has(build(job), text)) << build(job);
    }
    for (const auto &[port, text] :
         Keys{{"0873", " --port=0873 "}, {"873 ", " --port=873  "}, {"22", " --port=22 "}}) {
        copy_text(job.port, port);
        EXPECT_TRUE(has(build(job), "\"" + text + "/srv")) << build(job);
    }
    std::filesystem::remove_all("/srv/share1");
    std::filesystem::create_directory_symlink("/tmp", "/srv/share1");
    job.backup_type = 2;
    EXPECT_TRUE(build(job).ends_with("::backup/share1 /srv/share1 ")) << "a link gets no slash at either end";
}

TEST_F(Command, HostileAndOversizedValuesAreQuotedOrRefused)
{
    RsyncJob odd = make_job("it's $x`y` #1");
    EXPECT_TRUE(has(build(odd), "--job-name=it\\'s\\ \\$x\\`y\\`\\ \\#1 -aHq8"));
    EXPECT_TRUE(has(build(odd), "--password-file=\"/tmp/r_it's \\$x\\`y\\` #1.passwd\""));

    const std::vector<std::function<void(RsyncJob &)>> refused = {
        [](RsyncJob &job) { copy_text(job.remote_ip, "-oProxyCommand=x"); },
        [](RsyncJob &job) { copy_text(job.remote_ip, "a;reboot"); },
        [](RsyncJob &job) { copy_text(job.rsync_user, "a b"); },
        [](RsyncJob &job) { copy_text(job.port, "873;x"); },
        [](RsyncJob &job) { copy_text(job.remote_path, "m/\"x"); },
        [](RsyncJob &job) { copy_text(job.local_path, "/srv/a|b"); },
        [](RsyncJob &job) { copy_text(job.rsync_pwd_file, "/tmp/\"; reboot"); },
        [](RsyncJob &job) { job.use_ssh = 1, copy_text(job.ssh_user, "x' y"); },
        [](RsyncJob &job) { job.use_ssh = 1, copy_text(job.ssh_pwd, "x\" y"); },
        [](RsyncJob &job) { copy_text(job.remote_path, std::string(1023, 'p')); },
        [](RsyncJob &job) { copy_text(job.remote_path, std::string(600, '$')); },
        [](RsyncJob &job) { copy_text(job.local_path, std::string(1100, 'p')); },
        [](RsyncJob &job) {
            copy_text(job.remote_path, std::string(1000, 'p')),
                copy_text(job.local_path, std::string(1000, 'p'));
        },
    };
    for (std::size_t i = 0; i < refused.size(); ++i) {
        RsyncJob job = make_job("j");
        refused[i](job);
        EXPECT_EQ(build(job), "(refused)") << i;
    }
    RsyncJob unused = make_job("j");
    copy_text(unused.ssh_user, "not used; here");
    EXPECT_NE(build(unused), "(refused)");
}

TEST_F(Command, ThePasswordFileHoldsWhatTheServerTakes)
{
    struct Case {
        int pwd_encoded;
        int server_type;
        std::string password;
        std::string content; // none: refused
    };
    const std::string longest(127, 'p');
    const std::string path = "/tmp/r_it's $x.passwd";
    write_file("/tmp/victim", "kept");
    for (const Case &one : std::vector<Case>{{0, 2, "secret", "secret\n"},
                                             {0, 1, "secret", "c2VjcmV0\n"},
                                             {1, 2, "c2VjcmV0", "secret\n"},
                                             {1, 1, "c2VjcmV0", "c2VjcmV0\n"},
                                             {0, 2, longest, longest + "\n"},
                                             {0, 1, longest.substr(33), ""},
                                             {1, 2, "!", ""}}) {
        CurrentJob = make_job("it's $x");
        CurrentJob.pwd_encoded = one.pwd_encoded;
        CurrentJob.server_type = one.server_type;
        copy_text(CurrentJob.rsync_pwd, one.password);
        std::filesystem::remove(path);
        std::filesystem::create_symlink("/tmp/victim", path);
        EXPECT_EQ(rsync_write_password_file(), !one.content.empty());
        if (one.content.empty()) continue;
        EXPECT_EQ(read_file(path) + octal_mode(path), one.content + "600");
    }
    EXPECT_EQ(read_file("/tmp/victim"), "kept");
}
