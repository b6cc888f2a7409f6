// Free space and sizes of folders, here and on the remote side.

#include "common/run_options.h"
#include "common/text.h"
#include "config/current_job.h"
#include "remote/sizes.h"
#include "support.h"

using namespace bakjob;

namespace
{

class Sizes : public Appliance
{
protected:
    void SetUp() override
    {
        Appliance::SetUp();
        CurrentJob = make_job("daily");
        copy_text(CurrentJob.remote_ip, "10.0.0.1");
        copy_text(CurrentJob.ssh_user, "me");
        copy_text(CurrentJob.ssh_pwd, "c3No");
        write_file("/tmp/reply", "5M\t/m\n");
    }

    static std::string remote_du(const std::string &folder, const std::string &before = "old")
    {
        SizeText size = "";
        copy_text(size, before);
        rsync_remote_du(folder, size);
        return size;
    }

    Fake ssh_{SSH, "touch /tmp/called\n"
                   "case \"$*\" in *'ls /usr/bin/du') [ -e /tmp/has_du ] && echo /usr/bin/du ;;\n"
                   "*) cat /tmp/reply ;; esac\n"};
};

} // namespace

TEST_F(Sizes, WordsOfRepliesAreJudged)
{
    const auto judged = [](auto judge, const std::string &line, const std::string &before = "old") {
        SizeText text = "";
        copy_text(text, before);
        judge(line, text);
        return std::string(text);
    };
    const std::string long_word(31, '7');
    for (const auto &[line, size] : Keys{{"/dev/sda4 1.8T 1.2T 600G 67% /mnt/HD/HD_a2", "600G"},
                                         {"  a\tb  c   d", "d"},
                                         {"", "N/A"},
                                         {"a b c", "N/A"},
                                         {std::string(200, 'x') + " 1 2 3G 4", "3G"},
                                         {"a b c " + long_word, long_word},
                                         {"a b c " + long_word + "7", "N/A"}})
        EXPECT_EQ(judged(size_of_df_line, line), size) << line;
    for (const auto &[line, size] : Keys{{"4.0K\t/x", "4.0K"},
                                         {"0\t/x", "0"},
                                         {"12k", "12k"},
                                         {"3.5T\t/x", "N/A"},
                                         {"42\t/x", "N/A"},
                                         {"du: cannot access", "N/A"},
                                         {std::string(40, '1') + "K", "N/A"}})
        EXPECT_EQ(judged(size_of_du_reply, line), size) << line;
    EXPECT_EQ(judged(size_of_du_reply, "", "7G"), "7G") << "an earlier text is left to be judged";
    EXPECT_EQ(judged(size_of_du_reply, " ", ""), "N/A");
}

TEST_F(Sizes, RemoteCommandsAreExact)
{
    const std::string excludes = " --exclude='.AppleDouble' --exclude='.AppleDB'  --exclude='.DS_Store' "
                                 "--exclude='.bin' --exclude='.AppleDesktop'  "
                                 "--exclude=\\''Network Trash Folder'\\' --exclude=\\''.!@#$recycle'\\'  "
                                 "--exclude='lost+found' --exclude='Nas_Prog' "
                                 "--exclude='Ajaxpf'  --exclude='.systemfile' --exclude='P2P' "
                                 "--exclude='aMule' --exclude=\\''.!@$mmc'\\' "
                                 "--exclude=\\''.!@#$tarnelSync'\\' --exclude='.zorv' ";
    struct Case {
        int server;
        bool has_du;
        const char *ip;
        std::string command;
    };
    const std::vector<Case> cases = {
        {1, true, "10.0.0.1", "-d 'c3No' 10.0.0.1 /usr/bin/du -sh " + excludes + " /m 2>&1"},
        {1, true, "fe80::1", "-d 'c3No' -6 fe80::1%egiga0 /usr/bin/du -sh " + excludes + " /m 2>&1"},
        {1, true, "::1", "-d 'c3No' -6 ::1 /usr/bin/du -sh " + excludes + "  /m 2>&1"},
        {1, false, "10.0.0.1", "-d 'c3No' 10.0.0.1 du -sh /m  2>&1"},
        {1, false, "fe80::1", "-d 'c3No' -6 fe80::1%egiga0 du -sh  /m 2>&1"},
        {1, false, "::1", "-d 'c3No' -6 ::1 du -sh /m  2>&1"},
        {2, true, "10.0.0.1", "-d 'c3No' me@10.0.0.1 du -sh /m 2>&1"},
        {2, true, "fe80::1", "-6 -d 'c3No' me@fe80::1%egiga0 du -sh /m 2>&1"}};
    run_options.debug_mode = 1;
    for (const Case &one : cases) {
        shell(one.has_du ? "touch /tmp/has_du" : "rm -f /tmp/has_du");
        CurrentJob.server_type = one.server;
        copy_text(CurrentJob.remote_ip, one.ip);
        EXPECT_EQ(printed_by([] { EXPECT_EQ(remote_du("/m"), "5M"); }),
                  "--->[/usr/sbin/ssh " + one.command + "]\n");
    }
    SizeText free[VOLUMES] = {};
    write_file("/tmp/reply", "x 1 2 3G /mnt/HD/HD_b2\n");
    copy_text(CurrentJob.remote_ip, "10.0.0.1");
    const auto trace = lines_of(printed_by([&] { rsync_remote_free_space(free); }));
    ASSERT_EQ(trace.size(), 12U);
    EXPECT_EQ(trace[1], "--->[/usr/sbin/ssh -d 'c3No' me@10.0.0.1 df -h | grep HD_b2 2>&1]");
    EXPECT_EQ(trace[5], "[x 1 2 3G /mnt/HD/HD_b2]");
    EXPECT_EQ(trace[9], "--->[3G]");
    EXPECT_STREQ(free[0], "N/A");
    EXPECT_STREQ(free[1], "3G");
}

TEST_F(Sizes, HostileFoldersAreNeverSent)
{
    for (const char *folder : {"/a b", "/a;reboot", "/$(reboot)", "/`reboot`", "/a'b", "/a&b", "/a|b", "/a>b",
                               "/a\nb", "/a\"b", "/*", "-x", "/a\\b"})
        EXPECT_EQ(remote_du(folder), "N/A") << folder;
    copy_text(CurrentJob.ssh_user, "a b");
    EXPECT_EQ(remote_du("/m", "7G"), "N/A") << "a refused login is no earlier text";
    copy_text(CurrentJob.ssh_user, "me");
    EXPECT_FALSE(exists("/tmp/called"));
    EXPECT_EQ(remote_du("/100%+x=y"), "5M");
    CurrentJob.remote_ip[0] = '\0';
    EXPECT_EQ(remote_du("/m", "kept"), "kept");
}

TEST_F(Sizes, LocalFoldersAreAddedUp)
{
    write_file("/mnt/HD/HD_a2/My Photos/f", std::string(3'000'000, 'x'));
    write_file("/mnt/HD/HD_a2/b/f", std::string(2'000'000, 'x'));
    write_file("/mnt/HD/HD_a2/b/lost+found/f", std::string(9'000'000, 'x'));
    char folders[] = "/mnt/HD/HD_a2/My Photos:/mnt/HD/HD_a2/b";
    SizeText size = "";
    rsync_local_du(folders, size);
    const std::string total =
        shell("/usr/bin/du -shc --exclude=lost+found '/mnt/HD/HD_a2/My Photos' /mnt/HD/HD_a2/b | tail -1")
            .output;
    EXPECT_EQ(size, total.substr(0, total.find('\t')));
    EXPECT_EQ(std::string(size).back(), 'M');
    EXPECT_STREQ(folders, "/mnt/HD/HD_a2/My Photos");
    char refused[] = "/mnt/HD/HD_a2/b:/x|y";
    rsync_local_du(refused, size);
    EXPECT_STREQ(size, "N/A");
    shell("mount -t tmpfs -o size=64m vol /mnt/HD/HD_a2");
    rsync_local_free_space("HD_a2", size);
    shell("umount /mnt/HD/HD_a2");
    EXPECT_STREQ(size, "64M");
    rsync_local_free_space("nosuch; reboot", size);
    EXPECT_STREQ(size, "N/A");
}
