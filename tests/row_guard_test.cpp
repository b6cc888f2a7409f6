// What users of a share put at the names of a job's snapshots is neither read nor changed.

#include "support.h"

#include <filesystem>

namespace fs = std::filesystem;

namespace
{

class RowGuard : public ApplianceWithShare
{
protected:
    void SetUp() override
    {
        ApplianceWithShare::SetUp();
        write_file("/tmp/victim/daily.0/kept", "kept");
        shell("touch --date=@1000 /tmp/victim /tmp/victim/daily.0");
    }

    void set_up_with(const Keys &keys)
    {
        SetUp();
        add_job(keys);
        for (const int number : {0, 1})
            write_file(SHARE + "/daily." + std::to_string(number) + "/file", "x");
    }

    static std::string calls() { return shell("cat /tmp/calls 2>/dev/null | tr '\\n' ' '").output; }

    static std::string victim()
    {
        return shell("find /tmp/victim -printf '%p %T@ %n\\n' | sort; cat /tmp/victim/daily.0/kept").output;
    }

    static inline const Keys PULL{{"backup_type", "2"}, {"inc_enable", "1"}};
    // Notes what it is called for, and does what /tmp/at_KIND says.
    Fake rsync_{RSYNC, KIND_OF_CALL +
                           "echo $kind >>/tmp/calls\n[ ! -e /tmp/at_$kind ] || . /tmp/at_$kind\nexit 0\n"};
};

TEST_F(RowGuard, LinksAndFilesInTheRowAreRefusedBeforeAnythingIsAsked)
{
    const std::vector<std::string> kinds = {"ln -s /tmp/victim/daily.0 ", "ln -s /tmp/none ", "mkfifo ",
                                            "echo x >"};
    struct Case {
        std::string arguments;
        std::string name;
        std::string state;
        Keys keys;
    };
    Keys push_of_restore{{"inc_enable", "1"}};
    const std::vector<Case> cases = {{"-r daily", "daily.0", "4", PULL},
                                     {"-r daily", "daily.1", "4", PULL},
                                     {"-r daily", "daily.2", "4", PULL},
                                     {"-i x -r daily", "daily.0", "4", push_of_restore},
                                     {"-n 2 -r daily", "daily.1", "9", PULL}};
    for (const Case &c : cases) {
        for (const std::string &kind : kinds) {
            set_up_with(c.keys);
            const std::string path = SHARE + "/" + c.name;
            fs::remove_all(path);
            ASSERT_EQ(shell(kind + path).status, 0);
            const std::string before = victim();
            const Ran ran = bakjob_program("-d " + c.arguments);
            EXPECT_TRUE(has(ran.output, "ERROR: local_path refused: [" + path + "] is "));
            EXPECT_EQ(calls(), "") << c.arguments << kind;
            EXPECT_EQ(job_key(1, c.state == "4" && c.arguments[1] == 'i' ? "rstate" : "state"), c.state);
            EXPECT_EQ(alerts().size(), 1U);
            EXPECT_EQ(victim(), before);
            EXPECT_TRUE(exists(path)) << "left for somebody to look at";
        }
    }
    set_up_with(PULL);
    fs::create_directory_symlink("/tmp/victim/daily.0", SHARE + "/daily.3");
    bakjob_program("-r daily");
    EXPECT_EQ(job_key(1, "state"), "2") << "outside of the row of three";
    set_up_with(PULL);
    bakjob_program("-n 9 -r daily");
    EXPECT_EQ(calls(), "write dry run ") << "missing ones are for the transfer to miss";
}

TEST_F(RowGuard, WhatIsPutThereInTheMiddleIsMetByNoFurtherCommand)
{
    struct Case {
        std::string when;
        std::string path;
        std::string arguments;
        std::string state;
        std::string calls;
        Keys keys;
    };
    const std::string row = SHARE + "/daily.";
    const std::string all = "list write dry run ";
    const std::vector<Case> cases = {
        {"write", row + "0", "-r daily", "4", "list write ", PULL},
        {"write", row + "2", "-r daily", "4", "list write ", PULL},
        {"dry", row + "0", "-r daily", "4", "list write dry ", PULL},
        {"run", row + "0", "-r daily", "4", all, PULL},
        {"write", row + "1", "-n 2 -r daily", "9", "write ", PULL},
        {"dry", row + "1", "-n 2 -r daily", "9", "write dry ", PULL},
        {"dry", SHARE + "/sub", "-r daily", "4", "list write dry ", {}},
        {"dry", SHARE + "/sub", "-r daily", "4", "list write dry ", {{"backup_type", "2"}}},
    };
    for (const Case &c : cases) {
        Keys keys = c.keys;
        const bool sub = c.path.ends_with("/sub");
        if (sub) keys["local_path"] = c.path;
        keys["retry"] = "3"; // a refusal is not tried again
        set_up_with(keys);
        fs::create_directories(SHARE + "/sub");
        write_file("/tmp/at_" + c.when, "rm -rf " + c.path + "; ln -s /tmp/victim/daily.0 " + c.path + "\n");
        const std::string before = victim();
        const Ran ran = bakjob_program("-d " + c.arguments);
        EXPECT_TRUE(has(ran.output, "ERROR: local_path refused: [" + c.path + "] is a link"));
        EXPECT_EQ(calls(), c.calls) << c.when << c.path;
        EXPECT_EQ(job_key(1, "state"), c.state) << c.when << c.path;
        EXPECT_EQ(victim(), before) << "not even its time";
    }
}

TEST_F(RowGuard, ACheckKnowsAMountThatIsSafe)
{
    add_job({{"backup_type", "2"}});
    for (const std::string options : {"nosuid", "nodev", "nosuid,nodev"}) {
        shell("mount -t tmpfs -o " + options + " share " + SHARE);
        const std::string found = shell("/usr/sbin/bakjobctl check daily").output;
        EXPECT_EQ(found.find("setuid") != std::string::npos, options != "nosuid,nodev") << options << found;
        shell("umount " + SHARE);
    }
}

TEST_F(RowGuard, NoStepOfTheRotationGoesThroughALink)
{
    for (const std::string program : {"rm", "mv"}) {
        set_up_with(PULL);
        fs::create_directories(SHARE + "/daily.2");
        // Planted by the step before, with the program's own result.
        const Fake planting("/usr/local/bin/" + program, "/bin/" + program + " \"$@\"\n/bin/rm -rf " + SHARE +
                                                             "/daily.1; ln -s /tmp/victim " + SHARE +
                                                             "/daily.1\n");
        const std::string before = victim();
        bakjob_program("-r daily");
        EXPECT_EQ(victim(), before) << program;
        EXPECT_EQ(calls(), "list write ") << program;
        EXPECT_EQ(job_key(1, "state"), "4") << program;
    }
}

} // namespace
