// An empty folder at the name of one of our files is no reason to fail for ever.

#include "common/debug_log.h"
#include "common/run_options.h"
#include "support.h"

#include <filesystem>

namespace fs = std::filesystem;

TEST_F(ApplianceWithShare, EmptyFoldersAtOurNamesGiveWay)
{
    const std::string copy = "/tmp/remote_rshareinfo_daily.txt";
    const std::vector<std::string> names = {"/tmp/r_daily.passwd", "/tmp/r_daily", "/tmp/r_daily.dump_size",
                                            "/tmp/rsync_bakcup_src_folder_name.daily"};
    add_job({{"ssh_pwd", "cm9vdHB3"}}); // to make the folder that is missing over there
    for (const std::string &name : names)
        fs::create_directories(name);
    fs::create_directories(copy);
    const Ran ran = bakjob_program("-d -r daily");
    EXPECT_EQ(job_key(1, "state"), "2") << ran.output;
    EXPECT_TRUE(exists("/remote/backup/S1_remote_backup/daily/Public/file"));
    EXPECT_FALSE(exists(copy));
    for (const std::string &name : names)
        EXPECT_TRUE(fs::is_regular_file(name)) << name;

    fs::create_directories("/tmp/rsync_debug");
    bakjob::run_options.debug_mode = 2;
    bakjob::DebugLog("traced\n");
    EXPECT_EQ(read_file("/tmp/rsync_debug"), "traced\n");

    fs::remove("/tmp/r_daily.passwd");
    write_file("/tmp/r_daily.passwd/kept", "x");
    bakjob_program("-r daily");
    EXPECT_EQ(job_key(1, "state"), "4");
    EXPECT_TRUE(exists("/tmp/r_daily.passwd/kept")) << "somebody's files";
}
