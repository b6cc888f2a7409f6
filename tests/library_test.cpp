// What the module offers to other parts of the appliance: job operations, local paths, sizes, discovery.

#include "cli/local_paths.h"
#include "common/folder_table.h"
#include "common/run_options.h"
#include "common/shell.h"
#include "common/text.h"
#include "config/current_job.h"
#include "config/job_list.h"
#include "config/job_operations.h"
#include "config/remote_modules.h"
#include "platform/config_store.h"
#include "remote/discovery.h"
#include "remote/sizes.h"
#include "support.h"

#include <cstring>
#include <filesystem>
#include <sys/wait.h>
#include <unistd.h>

using namespace bakjob;
namespace fs = std::filesystem;

class Operations : public Appliance
{
protected:
    static std::string names()
    {
        std::string all;
        const int count = std::max(0, std::atoi(store_get("/backup_mgr/rsync/count").c_str()));
        for (int i = 1; i <= count; ++i)
            all += job_key(i, "job_name") + job_key(i, "enable") + " ";
        return all;
    }

    static void schedule(const std::vector<std::string> &jobs)
    {
        store_set("/system_mgr/crond/list/count", "1");
        store_set("/system_mgr/crond/list/name:1", "rsync");
        store_set("/system_mgr/crond/rsync/count", std::to_string(jobs.size()));
        for (std::size_t i = 0; i < jobs.size(); ++i) {
            store_set("/system_mgr/crond/rsync/item:" + std::to_string(i + 1) + "/run",
                      "bakjob -r '" + jobs[i] + "'");
        }
        store_save();
    }
};

TEST_F(Operations, EachIsAWholeCycleThatLeavesNoList)
{
    EXPECT_EQ(rsync_job_exists("a"), 0);
    for (const char *name : {"a", "b", "c"})
        EXPECT_EQ(rsync_add_job(make_job(name)), 1);
    EXPECT_EQ(rsync_add_job(make_job("b")), 0);
    EXPECT_EQ(rsync_disable_job("b"), 1);
    EXPECT_EQ(names(), "a1 b0 c1 ");
    EXPECT_EQ(rsync_enable_job("b"), 1);
    EXPECT_EQ(rsync_job_exists("b"), 1);
    EXPECT_EQ(rsync_delete_job("a"), 1);
    EXPECT_EQ(names(), "b1 c1 ");
    const std::string before = read_file("/etc/NAS_CFG/config.xml");
    RsyncJob untouched = make_job("mine");
    for (const int result : {rsync_enable_job("x"), rsync_disable_job("x"), rsync_delete_job("x"),
                             rsync_get_job(untouched, "x"), rsync_modify_job(make_job("y"), "x")}) {
        EXPECT_EQ(result, 0);
    }
    EXPECT_STREQ(untouched.job_name, "mine");
    EXPECT_EQ(read_file("/etc/NAS_CFG/config.xml"), before);
    EXPECT_EQ(rsync_get_job(untouched, "c"), 1);
    EXPECT_STREQ(untouched.job_name, "c");
    EXPECT_EQ(rsync_job_list_empty(), 1);
    EXPECT_FALSE(exists("/var/lib/device_flash/config.xml")) << "flash is not theirs to write";
}

TEST_F(Operations, RenamingOntoAnotherNameKeepsTheFirstAtTheNextLoad)
{
    for (const char *name : {"a", "b"})
        rsync_add_job(make_job(name));
    RsyncJob renamed = make_job("a");
    renamed.pwd_encoded = 0;
    copy_text(renamed.rsync_pwd, "plain");
    copy_text(renamed.user_description, "was b");
    EXPECT_EQ(rsync_modify_job(renamed, "b"), 1);
    EXPECT_EQ(names(), "a1 a1 ");
    EXPECT_EQ(job_key(2, "rsync_pwd"), "plain") << "as given, until the next load and save";
    EXPECT_EQ(rsync_enable_job("a"), 1);
    EXPECT_EQ(names(), "a1 ");
    EXPECT_EQ(job_key(1, "user_description"), "");
    EXPECT_EQ(rsync_modify_job(renamed, "a"), 1);
    EXPECT_EQ(rsync_disable_job("a"), 1);
    EXPECT_EQ(job_key(1, "rsync_pwd"), "cGxhaW4=");
}

TEST_F(Operations, SchedulerEntriesFollowTheJobs)
{
    for (const char *name : {"a", "ab"}) {
        RsyncJob job = make_job(name);
        job.schedule_mode = 1;
        rsync_add_job(job);
    }
    schedule({"ab", "a"});
    RsyncJob job = make_job("a");
    job.schedule_mode = 2;
    rsync_modify_job(job, "a");
    EXPECT_EQ(store_get("/system_mgr/crond/rsync/count"), "2") << "what it had was a timetable";
    rsync_modify_job(job, "a");
    EXPECT_EQ(store_get("/system_mgr/crond/rsync/count"), "1") << "the first entry that holds the name";
    EXPECT_EQ(store_get("/system_mgr/crond/rsync/item:1/run"), "bakjob -r 'a'");
    rsync_delete_job("ab");
    EXPECT_EQ(store_get("/system_mgr/crond/rsync/count"), "1");
    rsync_delete_job("a");
    EXPECT_EQ(store_get("/system_mgr/crond/list/count"), "0");
    EXPECT_EQ(store_get("/backup_mgr/rsync/count"), "(none)");
}

TEST_F(Operations, OfEightProcessesAtOnceNoneIsLost)
{
    for (int i = 0; i < 8; ++i)
        rsync_add_job(make_job("kept" + std::to_string(i)));
    for (int i = 0; i < 8; ++i) {
        if (fork() != 0) continue;
        const std::string mine = std::to_string(i);
        int failed = 0;
        for (int n = 0; n < 5; ++n) {
            failed += rsync_add_job(make_job("new" + mine)) == 1 ? 0 : 1;
            failed += rsync_disable_job("kept" + mine) == 1 ? 0 : 1;
            failed += rsync_job_exists("kept" + std::to_string(7 - i)) == 1 ? 0 : 1;
            if (n < 4) failed += rsync_delete_job("new" + mine) == 1 ? 0 : 1;
        }
        _exit(failed);
    }
    int status = 0;
    while (wait(&status) > 0)
        EXPECT_EQ(status, 0);
    std::string all = names();
    for (int i = 0; i < 8; ++i) {
        EXPECT_NE(all.find("kept" + std::to_string(i) + "0 "), std::string::npos) << all;
        EXPECT_NE(all.find("new" + std::to_string(i) + "1 "), std::string::npos) << all;
    }
    EXPECT_EQ(store_get("/backup_mgr/rsync/count"), "16");
}

class LocalPaths : public Appliance
{
};

TEST_F(LocalPaths, VolumesAreFoundByTheirSharedNames)
{
    const std::string long_word(64, 'w');
    write_file("/etc/shared_name",
               "Volume_1 = HD_a2 /x\nVolume_2 = HD_b2 HD_a2\n" + long_word + " = HD_c2\n");
    const Keys paths = {{"/mnt/HD/HD_a2/Public/x", "/Volume_1/Public/x"},
                        {"/mnt/HD/HD_b2/P", "/Volume_2/P"},
                        {"/mnt/HD/HD_a2", "/Volume_1/"},
                        {"/mnt/HD/HD_a2/", "/Volume_1/"},
                        {"/mnt/HD_a2/Public", ""},
                        {"/mnt/HD/HD_d2/P", ""},
                        {"/mnt/HD/HD_c2/P", ""},
                        {"/mnt/HD/", ""},
                        {"/mnt/HD/HD", ""},
                        {"/mnt/HD/HD_a2/" + std::string(1020, 'x'), ""}};
    for (const auto &[path, shared] : paths)
        EXPECT_EQ(rsync_shared_path(path), shared) << path;
    const std::map<std::string, int> volumes = {{"/mnt/HD/HD_a2/Public", 1},
                                                {"/mnt/HD/HD_a2", 1},
                                                {"/mnt/HD/HD_x2/P", 0},
                                                {"/mnt/HD", 0},
                                                {"/mnt/HD/", 0},
                                                {"/x/y/HD_b2", 1},
                                                {"", 0}};
    for (const auto &[path, is_shared] : volumes)
        EXPECT_EQ(rsync_volume_is_shared(path), is_shared) << path;
    fs::remove("/etc/shared_name");
    EXPECT_STREQ(rsync_shared_path("/mnt/HD/HD_a2/x"), "");
    EXPECT_EQ(rsync_volume_is_shared("/mnt/HD/HD_a2/x"), 0);
}

TEST_F(LocalPaths, FoldersAreMadeOpenToAll)
{
    EXPECT_EQ(rsync_make_dir(""), -1);
    EXPECT_EQ(rsync_make_dir("/tmp/a\"b"), -1);
    EXPECT_EQ(rsync_make_dir("-p"), -1);
    EXPECT_EQ(rsync_make_dir("/tmp/it's $x/y"), 0);
    EXPECT_EQ(octal_mode("/tmp/it's $x/y"), "777");
    write_file("/tmp/file", "");
    EXPECT_NE(rsync_make_dir("/tmp/file/y"), 0);
    fs::create_directory_symlink("/mnt", "/tmp/link");
    EXPECT_EQ(rsync_is_dir("/tmp/it's $x"), 1);
    EXPECT_EQ(rsync_is_dir("/tmp/link") + rsync_is_dir("/tmp/file") + rsync_is_dir("/tmp/none"), 0);
}

class Sizes : public Appliance
{
protected:
    void SetUp() override
    {
        Appliance::SetUp();
        CurrentJob = make_job("daily");
        copy_text(CurrentJob.ssh_user, "me");
        copy_text(CurrentJob.ssh_pwd, "c3No");
        copy_text(CurrentJob.local_path, "/mnt/HD/HD_a2/Public");
    }

    // Records how it was called, each argument in brackets, and prints /tmp/reply.
    Fake ssh_{"/usr/sbin/ssh", "for a; do printf '[%s]' \"$a\"; done >>/tmp/calls; echo >>/tmp/calls\n"
                               "case \"$*\" in *'ls /usr/bin/du') [ -e /tmp/has_du ] && echo /usr/bin/du ;;\n"
                               "*rsyncd.conf) cat /tmp/config ;;\n*) cat /tmp/reply ;; esac\n"};
};

TEST_F(Sizes, WordsOfRepliesAreJudged)
{
    const std::string long_word(31, '7');
    const std::vector<std::pair<std::string, std::string>> lines = {
        {"/dev/sda4 1.8T 1.2T 600G 67% /mnt/HD/HD_a2", "600G"},
        {"  a\tb  c   d", "d"},
        {"", "N/A"},
        {"a b c", "N/A"},
        {std::string(200, 'x') + " 1 2 3G 4", "3G"},
        {"a b c " + long_word, long_word},
        {"a b c " + long_word + "7", "N/A"}};
    for (const auto &[line, size] : lines) {
        SizeText text = "old";
        size_of_df_line(line, text);
        EXPECT_EQ(text, size) << line;
    }
    const std::vector<std::pair<std::string, std::string>> replies = {{"4.0K\t/x", "4.0K"},
                                                                      {"0\t/x", "0"},
                                                                      {"12k", "12k"},
                                                                      {"3.5T\t/x", "N/A"},
                                                                      {"42\t/x", "N/A"},
                                                                      {"du: cannot access", "N/A"},
                                                                      {std::string(40, '1') + "K", "N/A"}};
    for (const auto &[line, size] : replies) {
        SizeText text = "old";
        size_of_du_reply(line, text);
        EXPECT_EQ(text, size) << line;
    }
    SizeText earlier = "7G";
    size_of_du_reply("", earlier);
    EXPECT_STREQ(earlier, "7G") << "an empty reply leaves the earlier text to be judged";
    copy_text(earlier, "");
    size_of_du_reply(" ", earlier);
    EXPECT_STREQ(earlier, "N/A");
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
    write_file("/tmp/reply", "5M\t/m\n");
    run_options.debug_mode = 1;
    for (const Case &one : cases) {
        if (one.has_du) write_file("/tmp/has_du", "");
        if (!one.has_du) fs::remove("/tmp/has_du");
        CurrentJob.server_type = one.server;
        copy_text(CurrentJob.remote_ip, one.ip);
        SizeText size = "";
        testing::internal::CaptureStdout();
        rsync_remote_du("/m", size);
        EXPECT_EQ(testing::internal::GetCapturedStdout(), "--->[/usr/sbin/ssh " + one.command + "]\n");
        EXPECT_STREQ(size, "5M");
    }
    SizeText free[VOLUMES] = {};
    write_file("/tmp/reply", "x 1 2 3G /mnt/HD/HD_b2\n");
    copy_text(CurrentJob.remote_ip, "10.0.0.1");
    testing::internal::CaptureStdout();
    rsync_remote_free_space(free);
    const auto trace = lines_of(testing::internal::GetCapturedStdout());
    ASSERT_EQ(trace.size(), 12U);
    EXPECT_EQ(trace[1], "--->[/usr/sbin/ssh -d 'c3No' me@10.0.0.1 df -h | grep HD_b2 2>&1]");
    EXPECT_EQ(trace[5], "[x 1 2 3G /mnt/HD/HD_b2]");
    EXPECT_EQ(trace[9], "--->[3G]");
    EXPECT_STREQ(free[0], "N/A");
    EXPECT_STREQ(free[1], "3G");
}

TEST_F(Sizes, HostileFoldersAreNeverSent)
{
    write_file("/tmp/reply", "5M\t/m\n");
    CurrentJob.server_type = 2;
    for (const char *folder : {"/a b", "/a;reboot", "/$(reboot)", "/`reboot`", "/a'b", "/a&b", "/a|b", "/a>b",
                               "/a\nb", "/a\"b", "/*", "-x", "/a\\b"}) {
        SizeText size = "old";
        rsync_remote_du(folder, size);
        EXPECT_STREQ(size, "N/A") << folder;
    }
    SizeText size = "7G";
    copy_text(CurrentJob.ssh_user, "a b");
    rsync_remote_du("/m", size);
    EXPECT_STREQ(size, "N/A") << "a refused login is no earlier text";
    copy_text(CurrentJob.ssh_user, "me");
    EXPECT_FALSE(exists("/tmp/calls"));
    rsync_remote_du("/100%+x=y", size);
    EXPECT_STREQ(size, "5M");
    CurrentJob.remote_ip[0] = '\0';
    copy_text(size, "kept");
    rsync_remote_du("/m", size);
    EXPECT_STREQ(size, "kept");
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
    shell("mkdir -p /mnt/HD/HD_a2 && mount -t tmpfs -o size=64m vol /mnt/HD/HD_a2");
    rsync_local_free_space("HD_a2", size);
    shell("umount /mnt/HD/HD_a2");
    EXPECT_STREQ(size, "64M");
    rsync_local_free_space("nosuch; reboot", size);
    EXPECT_STREQ(size, "N/A");
}

TEST_F(Sizes, ModulesAreReadFromTheRemoteConfiguration)
{
    struct Case {
        std::string config;
        std::string modules;
    };
    const std::string long_name(127, 'n');
    const std::string long_path = "/" + std::string(1022, 'p');
    const std::vector<Case> cases = {
        {"uid = root\n[ a ]\npath = /a\n[ b ]\ncomment = x\npath = /b", "a=/a b=/b "},
        {"[ a ]\n[ b ]\npath = /b\n", "b=/b "},
        {"[ a ]\npath = /1\n[ a ]\npath = /2\n", "a=/1 "},
        {"path = /0\n[ a ]\n[ b ]\npath = /b\n", "a=/0 b=/b "},
        {"[ a ]\npath = /x[1]\n", "a=/x[1] "},
        {"[ " + long_name + " ]\npath = " + long_path + "\n", long_name + "=" + long_path + " "},
        {"[ a ]\npath = /a" + std::string(4090, ' ') + "more\n[ b ]\npath = /b\n", "b=/b "},
        {"[ a ]" + std::string(5000, 'x') + " ]\npath = /a\n[ b ]\npath = /b\n", "b=/b "},
        {"[ " + long_name + "x ]\npath = /x\n[ b ]\npath = " + long_path + "p\n[ c ]\npath = /c\n", "c=/c "},
        {"", ""}};
    CurrentJob.server_type = 1;
    CurrentJob.backup_type = 1;
    for (const Case &one : cases) {
        write_file("/tmp/config", one.config);
        rsync_free_modules();
        EXPECT_TRUE(add_configured_modules("/tmp/config"));
        std::string modules;
        for (const RemoteModule *module = module_list->head; module != nullptr; module = module->next) {
            modules += module->name + std::string("=") + module->path + " ";
            EXPECT_STREQ(module->du_size, "0");
        }
        EXPECT_EQ(modules, one.modules);
    }
    EXPECT_FALSE(add_configured_modules("/tmp/none"));
    write_file("/tmp/reply", "x 1 2 3G HD_d2\n");
    rsync_discover_remote();
    EXPECT_STREQ(module_list->remote_free[3], "3G");
    EXPECT_STREQ(module_list->local_free[0], "");
    EXPECT_FALSE(exists("/tmp/remote_rinfo.txt"));
    CurrentJob.backup_type = 2;
    write_file("/tmp/config", "[ a ]\npath = /a\n[ b ]\npath = /b;reboot\n");
    write_file("/tmp/reply", "5M\t/a\n");
    rsync_discover_remote();
    EXPECT_STREQ(rsync_find_module("a")->du_size, "5M");
    EXPECT_STREQ(rsync_find_module("b")->du_size, "N/A");
    CurrentJob.rsync_mode = 1;
    copy_text(CurrentJob.remote_path, "/a");
    rsync_discover_remote();
    EXPECT_EQ(rsync_module_list_empty(), 1);
    EXPECT_STREQ(module_list->remote_size, "5M");
    EXPECT_STREQ(module_list->local_size, "");
}

TEST_F(Sizes, ACopyThatNeverAppearsEndsTheDiscovery)
{
    // Takes the copy away that the local shell made.
    const Fake rm("/usr/sbin/ssh.real", "");
    write_file("/usr/sbin/ssh", "#!/bin/sh\nrm /tmp/remote_rinfo.txt\n");
    CurrentJob.server_type = 1;
    copy_text(module_list->local_size, "old");
    const auto start = std::time(nullptr);
    rsync_discover_remote();
    EXPECT_GE(std::time(nullptr) - start, 10);
    EXPECT_LE(std::time(nullptr) - start, 13);
    EXPECT_EQ(rsync_module_list_empty(), 1);
    EXPECT_STREQ(module_list->local_size, "");
}

TEST_F(Sizes, DaemonListingsBecomeModulesLineByLine)
{
    const Fake rsync("/usr/sbin/rsync", "cat /tmp/listing; exit 3\n");
    write_file("/tmp/listing", "home           \tHomes\ndata\t\nhome\tagain\nno tab\n\tcomment only\n\n" +
                                   std::string(5000, 'x') + "\tlong\n" + std::string(128, 'n') + "\n");
    EXPECT_EQ(exit_code(rsync_list_daemon_modules()), 3);
    testing::internal::CaptureStdout();
    rsync_print_modules();
    std::string printed;
    for (const char *name : {"home", "data", "no tab", ""}) {
        printed += "name \t\t\t: [" + std::string(name) + "]\npath \t\t\t: []\ndu_size \t\t: [0]\n";
    }
    EXPECT_EQ(testing::internal::GetCapturedStdout(), printed);
    shell("seq 1 5000 >/tmp/listing");
    rsync_list_daemon_modules();
    EXPECT_EQ(module_list->count, 1024) << "however much a daemon prints";

    EXPECT_EQ(rsync_remove_module(module_list->tail), 1);
    RemoteModule module{};
    copy_text(module.name, "1");
    copy_text(module.path, "/p");
    EXPECT_STREQ(rsync_add_module(module)->path, "") << "present already";
    rsync_update_module(module, "1");
    EXPECT_STREQ(module_list->head->path, "/p");
    rsync_update_module(module, "unknown");
    copy_text(module.name, "last");
    EXPECT_EQ(rsync_add_module(module), module_list->tail);
    EXPECT_EQ(rsync_remove_module(&module), 0);
    rsync_free_modules();
    EXPECT_EQ(rsync_module_list_empty(), 1);
}

TEST_F(Sizes, ARemoteSecretIsComparedAsBase64)
{
    const std::map<std::string, RemoteReplyCode> secrets = {
        {"root:c2VjcmV0\n", REPLY_OK},
        {"root:secret\n", REPLY_AUTH_FAILED},
        {"root:c2VjcmV0x\n", REPLY_AUTH_FAILED},
        {"bk:x\nroot:c2VjcmV0\n", REPLY_OK},
        {"", REPLY_AUTH_FAILED},
        {"bk:c2VjcmV0\n", REPLY_AUTH_FAILED},
        {"root:other\nroot:c2VjcmV0\n", REPLY_AUTH_FAILED}};
    for (const int encoded : {1, 0}) {
        CurrentJob.pwd_encoded = encoded;
        copy_text(CurrentJob.rsync_pwd, encoded == 1 ? "c2VjcmV0" : "secret");
        for (const auto &[text, code] : secrets) {
            write_file("/tmp/reply", text);
            EXPECT_EQ(rsync_check_remote_secret(), code) << text;
        }
    }
    copy_text(CurrentJob.rsync_pwd, std::string(94, 'x'));
    EXPECT_EQ(rsync_check_remote_secret(), REPLY_AUTH_FAILED);
}

class RealRemoteSide : public Appliance
{
};

TEST_F(RealRemoteSide, IsDiscovered)
{
    CurrentJob = make_job("daily");
    copy_text(CurrentJob.remote_ip, "127.0.0.1");
    copy_text(CurrentJob.ssh_pwd, "cm9vdHB3");
    copy_text(CurrentJob.rsync_pwd, "cGFrdG8=");
    copy_text(CurrentJob.local_path, "/mnt/HD/HD_a2/Public");
    write_file("/remote/backup/f", std::string(3'000'000, 'x'));
    const auto names = [] {
        std::string all;
        for (const RemoteModule *m = module_list->head; m != nullptr; m = m->next)
            all += m->name + std::string(":") + m->path + " ";
        return all;
    };
    EXPECT_EQ(rsync_list_daemon_modules(), 0);
    EXPECT_EQ(names(), "backup: data: archive: ");
    CurrentJob.server_type = 1;
    CurrentJob.backup_type = 2;
    rsync_discover_remote();
    EXPECT_EQ(names(), "backup:/remote/backup data:/remote/data archive:/remote/archive ");
    const std::string size = shell("du -sh /remote/backup").output;
    EXPECT_EQ(rsync_find_module("backup")->du_size, size.substr(0, size.find('\t')));
    EXPECT_EQ(rsync_check_remote_secret(), REPLY_OK);
    copy_text(CurrentJob.rsync_pwd, "c2VjcmV0");
    EXPECT_EQ(rsync_check_remote_secret(), REPLY_AUTH_FAILED);
    copy_text(CurrentJob.remote_ip, "127.0.0.2:1");
    rsync_discover_remote();
    EXPECT_EQ(names(), "");
}
