// What people are told to do can be pasted, and nothing hides what they look for.

#include "ctl_support.h"

#include <filesystem>

namespace fs = std::filesystem;

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

TEST_F(Ctl, WhatStandsWhereARunMakesItsFilesIsAProblem)
{
    ASSERT_TRUE(says(add("daily"), 0, ""));
    for (const std::string folder : {"/tmp/r_daily.passwd", "/tmp/remote_rshareinfo_daily.txt"}) {
        fs::create_directories(folder);
        EXPECT_TRUE(says(ctl("check daily"), 0, "0 problems")) << "a run removes it";
        fs::create_directories(folder + "/x");
        EXPECT_TRUE(says(ctl("check daily"), 1, "problem  " + folder + ": it is a folder"));
        fs::remove_all(folder);
    }
}

TEST_F(Ctl, StrayFoldersHideNoSnapshot)
{
    ASSERT_TRUE(says(add("weekly", "backup_type=pull inc_enable=yes"), 0, ""));
    for (int i = 0; i < 10; ++i) {
        fs::create_directories("/mnt/HD/HD_a2/Public/weekly.0" + std::to_string(i));
    }
    fs::create_directories("/mnt/HD/HD_a2/Public/weekly.9");
    EXPECT_TRUE(says(ctl("snapshots weekly"), 0, "/mnt/HD/HD_a2/Public/weekly.9"));
}
