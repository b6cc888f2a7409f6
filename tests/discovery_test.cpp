// What the module finds out about a remote side: its modules, their folders and sizes, its secret.

#include "common/shell.h"
#include "common/text.h"
#include "config/current_job.h"
#include "config/remote_modules.h"
#include "remote/discovery.h"
#include "support.h"

using namespace bakjob;

namespace
{

class Discovery : public Appliance
{
protected:
    void SetUp() override
    {
        Appliance::SetUp();
        CurrentJob = make_job("daily");
        copy_text(CurrentJob.ssh_pwd, "c3No");
        CurrentJob.server_type = 1;
    }

    static std::string modules()
    {
        std::string all;
        for (const RemoteModule *module = module_list->head; module != nullptr; module = module->next)
            all += module->name + std::string("=") + module->path + ":" + module->du_size + " ";
        return all;
    }

    Fake ssh_{SSH, "case \"$*\" in *rsyncd.conf) cat /tmp/config ;; *) cat /tmp/reply ;; esac\n"};
};

} // namespace

TEST_F(Discovery, ModulesAreReadFromTheRemoteConfiguration)
{
    const std::string long_name(127, 'n');
    const std::string long_path = "/" + std::string(1022, 'p');
    for (const auto &[config, expected] : std::vector<std::pair<std::string, std::string>>{
             {"uid = root\n[ a ]\npath = /a\n[ b ]\ncomment = x\npath = /b", "a=/a:0 b=/b:0 "},
             {"[ a ]\n[ b ]\npath = /b\n", "b=/b:0 "},
             {"[ a ]\npath = /1\n[ a ]\npath = /2\n", "a=/1:0 "},
             {"path = /0\n[ a ]\n[ b ]\npath = /b\n", "a=/0:0 b=/b:0 "},
             {"[ a ]\npath = /x[1]\n", "a=/x[1]:0 "},
             {"[ " + long_name + " ]\npath = " + long_path + "\n", long_name + "=" + long_path + ":0 "},
             {"[ a ]\npath = /a" + std::string(4090, ' ') + "more\n[ b ]\npath = /b\n", "b=/b:0 "},
             {"[ a ]" + std::string(5000, 'x') + " ]\npath = /a\n[ b ]\npath = /b\n", "b=/b:0 "},
             {"[ " + long_name + "x ]\npath = /x\n[ b ]\npath = " + long_path + "p\n[ c ]\npath = /c\n",
              "c=/c:0 "},
             {"", ""}}) {
        write_file("/tmp/config", config);
        rsync_free_modules();
        EXPECT_TRUE(add_configured_modules("/tmp/config"));
        EXPECT_EQ(modules(), expected);
    }
    EXPECT_FALSE(add_configured_modules("/tmp/none"));
}

TEST_F(Discovery, MeasuresTheSideThatIsWrittenFrom)
{
    write_file("/tmp/config", "[ a ]\npath = /a\n[ b ]\npath = /b;reboot\n");
    write_file("/tmp/reply", "x 1 2 3G HD_d2\n");
    rsync_discover_remote();
    EXPECT_STREQ(module_list->remote_free[3], "3G");
    EXPECT_STREQ(module_list->local_free[0], "");
    EXPECT_FALSE(exists("/tmp/remote_rinfo.txt"));
    CurrentJob.backup_type = 2;
    write_file("/tmp/reply", "5M\t/a\n");
    rsync_discover_remote();
    EXPECT_EQ(modules(), "a=/a:5M b=/b;reboot:N/A ");
    CurrentJob.rsync_mode = 1;
    copy_text(CurrentJob.remote_path, "/a");
    rsync_discover_remote();
    EXPECT_EQ(modules(), "");
    EXPECT_STREQ(module_list->remote_size, "5M");
    EXPECT_STREQ(module_list->local_size, "");
}

TEST_F(Discovery, ACopyThatNeverAppearsEndsIt)
{
    // Takes the copy away that the local shell made.
    write_file(SSH, "#!/bin/sh\nrm /tmp/remote_rinfo.txt\n");
    copy_text(module_list->local_size, "old");
    const auto start = std::time(nullptr);
    rsync_discover_remote();
    EXPECT_GE(std::time(nullptr) - start, 10);
    EXPECT_LE(std::time(nullptr) - start, 13);
    EXPECT_EQ(modules(), "");
    EXPECT_STREQ(module_list->local_size, "");
}

TEST_F(Discovery, DaemonListingsBecomeModulesLineByLine)
{
    const Fake rsync(RSYNC, "cat /tmp/listing; exit 3\n");
    CurrentJob.server_type = 2;
    write_file("/tmp/listing", "home           \tHomes\ndata\t\nhome\tagain\nno tab\n\tcomment only\n\n" +
                                   std::string(5000, 'x') + "\tlong\n" + std::string(128, 'n') + "\n");
    EXPECT_EQ(exit_code(rsync_list_daemon_modules()), 3);
    EXPECT_EQ(modules(), "home=:0 data=:0 no tab=:0 =:0 ");
    EXPECT_TRUE(printed_by(rsync_print_modules)
                    .starts_with("name \t\t\t: [home]\npath \t\t\t: []\ndu_size \t\t: [0]\nname "));
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

TEST_F(Discovery, ARemoteSecretIsComparedAsBase64)
{
    for (const int encoded : {1, 0}) {
        CurrentJob.pwd_encoded = encoded;
        copy_text(CurrentJob.rsync_pwd, encoded == 1 ? "c2VjcmV0" : "secret");
        for (const char *secrets : {"root:c2VjcmV0\n", "bk:x\nroot:c2VjcmV0\n"}) {
            write_file("/tmp/reply", secrets);
            EXPECT_EQ(rsync_check_remote_secret(), REPLY_OK) << secrets;
        }
        for (const char *secrets :
             {"root:secret\n", "root:c2VjcmV0x\n", "", "bk:c2VjcmV0\n", "root:other\nroot:c2VjcmV0\n"}) {
            write_file("/tmp/reply", secrets);
            EXPECT_EQ(rsync_check_remote_secret(), REPLY_AUTH_FAILED) << secrets;
        }
    }
    copy_text(CurrentJob.rsync_pwd, std::string(94, 'x'));
    EXPECT_EQ(rsync_check_remote_secret(), REPLY_AUTH_FAILED);
}
