#include "common/run_options.h"
#include "common/shell.h"
#include "common/text.h"
#include "config/current_job.h"
#include "remote/daemon_config.h"
#include "remote/daemon_probe.h"
#include "remote/discovery.h"
#include "remote/remote_dir.h"
#include "remote/ssh_login.h"
#include "remote/ssh_probe.h"
#include "support.h"

#include <csignal>
#include <fcntl.h>
#include <unistd.h>

using namespace bakjob;

namespace
{

// Answers with the next block of /tmp/replies (split at lines "--") and records its arguments.
constexpr const char *REPLYING =
    "printf '%s|' \"$@\" >>/tmp/calls; echo >>/tmp/calls\n"
    "n=$(cat /tmp/n 2>/dev/null || echo 0); echo $((n + 1)) >/tmp/n\n"
    "awk -v want=\"$n\" '/^--$/ { block++; next } block == want' /tmp/replies >&2\n";

} // namespace

class Remote : public Appliance
{
protected:
    void SetUp() override
    {
        Appliance::SetUp();
        CurrentJob = make_job("daily");
        copy_text(CurrentJob.ssh_user, "me");
    }
};

TEST_F(Remote, RepliesAreJudgedByTheFirstFragmentInOrder)
{
    const std::map<std::string, RemoteReplyCode> cases = {
        {"", REPLY_OK},
        {"ls:no blank", REPLY_OK},
        {"connection refused", REPLY_OK},
        {"rsync: failed to connect: No route to host (113)", REPLY_NO_ROUTE},
        {"rsync: Connection refused (111)", REPLY_REFUSED},
        {"ERROR: module is read only: No such file or directory", REPLY_READ_ONLY},
        {"rsync: change_dir: No such file or directory (2)", REPLY_NO_DIR},
        {"ls: cannot access", REPLY_NO_DIR},
        {"x: Not a directory", REPLY_NO_DIR},
        {"@ERROR: chdir failed", REPLY_NO_DIR},
        {"@ERROR: Unknown module 'x'", REPLY_UNKNOWN_MODULE},
        {"@ERROR: auth failed on module x", REPLY_AUTH_FAILED},
        {"ERROR: auth failed on module x", REPLY_AUTH_FAILED},
        {"getaddrinfo: No address associated with hostname", REPLY_NO_ADDRESS},
        {"getaddrinfo: x: Name or service not known", REPLY_HOST_UNREACHABLE},
        {"Connection timed out", REPLY_HOST_UNREACHABLE},
        {"@ERROR: max connections", REPLY_ERROR},
    };
    for (const auto &[line, code] : cases)
        EXPECT_EQ(classify_reply_line(line), code) << line;
    EXPECT_EQ(rsync_classify_reply("echo fine; echo ERROR: late"), REPLY_OK);
    EXPECT_EQ(rsync_classify_reply("echo ERROR: early; exit 0"), REPLY_ERROR);
    EXPECT_EQ(rsync_classify_reply(std::string(COMMAND_SIZE, ' ')), REPLY_ERROR);
}

TEST_F(Remote, DaemonProbesAreExact)
{
    const std::vector<std::pair<std::string, std::string>> hosts = {
        {"10.0.0.1", "10.0.0.1"}, {"fe80::1", "[fe80::1%egiga0]"}, {"2001:db8::1", "[2001:db8::1]"}};
    for (const auto &[ip, host] : hosts) {
        const std::string six = host == ip ? "" : "6";
        RsyncJob job = make_job("daily");
        copy_text(job.remote_ip, ip);
        copy_text(job.remote_path, "m/a b");
        copy_text(job.port, "8730");
        copy_text(job.rsync_pwd_file, "/elsewhere");
        job.server_type = 1;
        EXPECT_EQ(module_list_command(job), "/usr/sbin/rsync  -8" + six + " " + host + ":: 2>&1");
        const std::string head = "/usr/sbin/rsync  -a8" + six + " --dry-run ";
        const std::string file = "--password-file=\"/tmp/r_daily.passwd\" ";
        for (const int backup_type : {1, 2, 3}) {
            for (const int direction : {0, 1}) {
                job.backup_type = backup_type;
                const bool pull = backup_type == 2 && direction == 0;
                job.rsync_mode = 2;
                EXPECT_EQ(write_test_command(job, direction),
                          head + file +
                              (pull ? "bk@" + host + "::m/a\\ b /tmp 2>&1"
                                    : "'/etc/hosts' bk@" + host + "::m/a\\ b 2>&1"));
                job.rsync_mode = 1;
                EXPECT_EQ(write_test_command(job, direction),
                          head + (pull ? "bk@" + host + ":m/a\\ b /tmp 2>&1"
                                       : "/etc/hosts bk@" + host + ":m/a\\ b 2>&1"));
            }
        }
    }
    CurrentJob.remote_ip[0] = '\0';
    EXPECT_EQ(rsync_daemon_test(), REPLY_ERROR);
    EXPECT_EQ(rsync_write_test(0), REPLY_ERROR);
}

TEST_F(Remote, SshCommandsFollowLoginAndAddress)
{
    const auto client = SshLogin::AS_CLIENT;
    const auto user = SshLogin::AS_USER;
    struct Case {
        const char *ip;
        std::string of_client; // with "PW" where the password stands, if there is one
        std::string of_user;
    };
    const std::vector<Case> cases = {{"10.0.0.1", "PW 10.0.0.1", "PWme@10.0.0.1"},
                                     {"fe80::1", "PW -6 fe80::1%egiga0", "-6 PWme@fe80::1%egiga0"},
                                     {"::1", "PW -6 ::1", "-6 PWme@::1"}};
    const auto with_password = [](std::string words, const std::string &password) {
        return "/usr/sbin/ssh " + words.replace(words.find("PW"), 2, password) + " ls /";
    };
    for (const Case &one : cases) {
        copy_text(CurrentJob.remote_ip, one.ip);
        copy_text(CurrentJob.ssh_pwd, "");
        EXPECT_EQ(ssh_command(CurrentJob, client, "ls /"), with_password(one.of_client, ""));
        EXPECT_EQ(ssh_command(CurrentJob, user, "ls /"), with_password(one.of_user, ""));
        copy_text(CurrentJob.ssh_pwd, "cHc=");
        EXPECT_EQ(ssh_command(CurrentJob, client, "ls /"), with_password(one.of_client, "-d 'cHc='"));
        EXPECT_EQ(ssh_command(CurrentJob, user, "ls /"), with_password(one.of_user, "-d 'cHc=' "));
    }
    CurrentJob.pwd_encoded = 0;
    copy_text(CurrentJob.ssh_pwd, "plain");
    EXPECT_EQ(ssh_password(CurrentJob), "cGxhaW4=");
    copy_text(CurrentJob.ssh_pwd, std::string(94, 'x'));
    EXPECT_FALSE(ssh_command(CurrentJob, client, "ls /"));
    CurrentJob.pwd_encoded = 1;
    copy_text(CurrentJob.ssh_pwd, "a' b");
    EXPECT_FALSE(ssh_command(CurrentJob, client, "ls /"));
    CurrentJob.ssh_pwd[0] = '\0';
    EXPECT_FALSE(ssh_command(CurrentJob, client, std::string(COMMAND_SIZE, 'x')));
    copy_text(CurrentJob.ssh_user, "-oProxyCommand=x");
    EXPECT_FALSE(ssh_command(CurrentJob, user, "ls /"));
}

TEST_F(Remote, SshTestRepairsAChangedHostKeyOnce)
{
    const std::string changed = std::string(58, '@') + "\nWARNING\n";
    struct Case {
        std::string replies;
        SshTestResult result;
        int logins; // after a changed key one more, when the old one is taken away
    };
    const std::vector<Case> cases = {
        {"bin\netc\n", SSH_OK, 1},
        {"", SSH_FAILED, 1},
        {"\nlater\n", SSH_FAILED, 1},
        {"ssh: No route to host\n", SSH_NO_ROUTE, 1},
        {"ssh: Connection refused\n", SSH_REFUSED, 1},
        {"me: Permission denied " + changed, SSH_DENIED, 1},
        {"ssh: Connection timed out\n", SSH_TIMED_OUT, 1},
        {std::string(27, '@') + "\n", SSH_OK, 1},
        {changed + "--\nbin\n", SSH_OK, 2},
        {changed + "--\n" + changed, SSH_FAILED, 2},
        {changed + "--\nConnection timed out\n", SSH_TIMED_OUT, 2},
        {changed + "--\nPermission denied\n", SSH_DENIED, 2},
        {changed + "--\n", SSH_FAILED, 2},
    };
    const Fake ssh(SSH, REPLYING);
    const Fake keygen("/usr/sbin/ssh-keygen", "echo \"$@\" >>/tmp/resets\n");
    copy_text(CurrentJob.remote_ip, "fe80::1");
    for (const Case &one : cases) {
        for (const char *file : {"/tmp/n", "/tmp/calls", "/tmp/resets"})
            unlink(file);
        write_file("/tmp/replies", one.replies);
        EXPECT_EQ(ssh_test(), one.result) << one.replies;
        EXPECT_EQ(lines_of(read_file("/tmp/calls")).size(), static_cast<std::size_t>(one.logins))
            << one.replies;
        EXPECT_EQ(read_file("/tmp/resets"), one.logins == 1 ? "" : "-R fe80::1%egiga0\n");
    }
    unlink("/tmp/calls");
    CurrentJob.server_type = 3;
    EXPECT_EQ(ssh_test(), SSH_FAILED);
    EXPECT_FALSE(exists("/tmp/calls"));
}

TEST_F(Remote, DaemonConfigurationIsReadByItsLayout)
{
    for (const auto &[line, name] : Keys{{"[ backup ]", "backup"},
                                         {"[ my photos ]", "my photos"},
                                         {"[ a ] b ]", "a ] b"},
                                         {"[backup]", "acku"},
                                         {"[  ]", ""}})
        EXPECT_EQ(section_name(line), name) << line;
    for (const char *line : {"[ path = x ]", "no brackets", "]", "[]", "[ ]", "x]"})
        EXPECT_FALSE(section_name(line)) << line;
    EXPECT_EQ(path_of_line("path = /mnt/HD/x"), "/mnt/HD/x");
    EXPECT_EQ(path_of_line("  path = /x"), "= /x") << "path lines begin at the first column";
    EXPECT_FALSE(path_of_line("paths=/x"));
}

TEST_F(Remote, AMissingFolderIsMadeBelowTheModulesOwn)
{
    struct Case {
        std::string config;
        std::string first;
        std::string second;
        std::string remote_command; // as ssh gets it; empty: none
    };
    const std::vector<Case> cases = {
        {"[ other ]\npath = /o\n[ backup ]\ncomment = x\npath = /mnt/HD/HD_a2/backup\n",
         "S123_remote_backup/job1/Public", "docs",
         "(cd /mnt/HD/HD_a2/backup;umask 000 ;mkdir  -p S123_remote_backup/job1/Public/docs)"},
        {"[ backup ]\n[ x ]\npath = /m\n", "s/j/P", "", "(cd /m;umask 000 ;mkdir  -p s/j/P/)"},
        {"[ backup ]\npath = /it's $HOME\n", "s", "it's #1 `x`",
         "(cd /it\\'s\\ \\$HOME;umask 000 ;mkdir  -p s/it\\'s\\ \\#1\\ \\`x\\`)"},
        {"[ Backup ]\npath = /m\n[backup]\npath = /m\n", "s", "x", ""},
        {"[ backup ]\n", "s", "x", ""},
        {"", "s", "x", ""},
        {"[ backup ]\npath = /m\";touch /tmp/pwned;\"\n", "s", "x", ""},
        {"[ backup ]\npath = relative\n", "s", "x", ""},
        {"[ backup ]\npath = /m\n", "-rf", "x", ""},
        {"[ backup ]\npath = /m\n", "s", std::string(1100, 'x'), ""},
    };
    // Every case has a remote side of its own, as each waits a second.
    const Fake ssh(SSH,
                   "for last; do :; done\nip=$(echo \"$*\" | grep -o '10[.]0[.]0[.][0-9]*')\ncase $* in\n"
                   "*'cat /etc/rsyncd.conf') cat /tmp/config.$ip ;;\n"
                   "*) printf '%s' \"$last\" >/tmp/command.$ip; exit 7 ;;\nesac\n");
    std::vector<pid_t> all;
    for (std::size_t i = 0; i < cases.size(); ++i) {
        const std::string ip = "10.0.0." + std::to_string(i);
        const std::string name = "it's " + std::to_string(i);
        write_file("/tmp/config." + ip, cases[i].config);
        write_file("/tmp/remote_rshareinfo_" + name + ".txt", "old");
        all.push_back(fork());
        if (all.back() != 0) continue;
        copy_text(CurrentJob.remote_ip, ip);
        _exit(exit_code(rsync_prepare_remote_dir(named(name), "backup", cases[i].first, cases[i].second)));
    }
    for (std::size_t i = 0; i < cases.size(); ++i) {
        EXPECT_EQ(wait_for(all[i]), cases[i].remote_command.empty() ? 255 : 7) << i;
        EXPECT_EQ(read_file("/tmp/command.10.0.0." + std::to_string(i)), cases[i].remote_command);
        EXPECT_FALSE(exists("/tmp/remote_rshareinfo_it's " + std::to_string(i) + ".txt"));
    }
    EXPECT_FALSE(exists("/tmp/pwned"));
}

TEST_F(Remote, AConfigurationWithoutEndFillsNoDisk)
{
    const Fake ssh(SSH, "exec 3>&1\n(yes | head -c 9000000) >&3\n"
                        "stat --format=%s /tmp/remote_r*.txt >>/tmp/size\n");
    std::signal(SIGXFSZ, SIG_IGN);
    run_options.debug_mode = 1;
    EXPECT_TRUE(has(printed_by([] {
                        EXPECT_FALSE(rsync_find_module_folder(named("daily"), "backup"));
                        CurrentJob.server_type = SERVER_SAME_KIND;
                        rsync_discover_remote();
                    }),
                    "ERROR: [/tmp/remote_rshareinfo_daily.txt] refused"));
    const auto sizes = lines_of(read_file("/tmp/size"));
    ASSERT_EQ(sizes.size(), 2U);
    for (const std::string &size : sizes)
        EXPECT_LT(std::stoi(size), 1'050'000) << "with what the captured output has already";
    EXPECT_EQ(shell("ls /tmp | grep 'remote.*txt'").output, "") << "neither copy stays";
    EXPECT_NE(std::signal(SIGXFSZ, SIG_DFL), SIG_DFL) << "as it was before";
    EXPECT_EQ(shell("ulimit -f").output, "unlimited\n");
}

TEST_F(Remote, ALongLogTakesTheMessagesOfTheFetch)
{
    const Fake ssh(SSH, "echo warning >&2 || exit; printf '[ backup ]\npath = /m\n'\n");
    write_file("/tmp/log", std::string(3'000'000, 'x'));
    EXPECT_EQ(in_child([] {
                  dup2(open("/tmp/log", O_WRONLY | O_APPEND), STDERR_FILENO);
                  return rsync_find_module_folder(named("daily"), "backup") == "/m" ? 5 : 0;
              }),
              5);
    EXPECT_TRUE(read_file("/tmp/log").ends_with("warning\n"));
}
