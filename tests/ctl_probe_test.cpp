// What a probe of a remote side says whose daemon greets whoever comes.

#include "ctl_support.h"

#include <filesystem>

namespace fs = std::filesystem;

namespace
{

constexpr const char *TARGET = "/remote/backup/S123_remote_backup/daily";

class CtlGreeting : public Ctl
{
protected:
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

TEST_F(CtlGreeting, TheReasonIsFoundBehindTheGreeting)
{
    struct Case {
        std::string settings;
        std::string setup; // for the shell
        int status;
        std::string found;
    };
    const std::string pull = "backup_type=pull remote_path=";
    const std::vector<Case> cases = {
        {"", "", 1, "is not there yet, and no run makes it, as the greeting hides that: \"Welcome"},
        {"", std::string("mkdir -p ") + TARGET, 0, "Public: lets the job in"},
        {"rsync_pwd=- <<<guess", "", 1, "does not take user and password: @ERROR: auth failed"},
        {"remote_path=nowhere/x", "", 1, "has no such module: @ERROR: Unknown module 'nowhere'"},
        {"remote_path=archive", "", 1, "has the module for reading only: ERROR: module is read only"},
        {pull + "data/none/x", "", 1, "is not there: rsync: [sender]"},
        {pull + "data", "mkdir -p /remote/data/S123_remote_backup/daily/Public", 0,
         "Public: lets the job in"},
    };
    for (const Case &one : cases) {
        SetUp();
        ASSERT_TRUE(says(add("daily"), 0, ""));
        greet("Welcome\nls: is what you type\nand Connection refused is what you see\n");
        ASSERT_EQ(shell(one.setup).status, 0);
        if (!one.settings.empty()) {
            ASSERT_EQ(shell("bash -c '/usr/sbin/bakjobctl set daily " + one.settings + "'").status, 0);
        }
        EXPECT_TRUE(says(ctl("check daily --probe"), one.status, one.found)) << one.settings;
    }
}

// The verdict is the run's, with a greeting and without.
TEST_F(CtlGreeting, ACheckPromisesWhatARunDoes)
{
    for (const char *greeting : {"Welcome\n", "Tools: none\n", "\nWelcome\n", ""}) {
        for (const bool there : {false, true}) {
            SetUp();
            ASSERT_TRUE(says(add("daily"), 0, ""));
            if (*greeting != '\0') greet(greeting);
            if (there) fs::create_directories(TARGET);
            const bool promised = ctl("check daily --probe").status == 0;
            bakjob_program("-r daily");
            EXPECT_EQ(ctl("status daily").status == 0, promised) << greeting << there;
            TearDown();
        }
    }
    SetUp();
    ASSERT_TRUE(says(add("daily"), 0, ""));
    greet("Tools: none\n");
    EXPECT_TRUE(says(ctl("check daily --probe"), 1, "a run takes its greeting for a failure: Tools: none"));
}

} // namespace
