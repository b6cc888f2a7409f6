// Volumes by their shared names, and folders that are made here.

#include "cli/local_paths.h"
#include "support.h"

#include <filesystem>

using namespace bakjob;
namespace fs = std::filesystem;

using LocalPaths = Appliance;

TEST_F(LocalPaths, VolumesAreFoundByTheirSharedNames)
{
    const std::string long_word(64, 'w');
    write_file("/etc/shared_name",
               "Volume_1 = HD_a2 /x\nVolume_2 = HD_b2 HD_a2\n" + long_word + " = HD_c2\n");
    for (const auto &[path, shared] : Keys{{"/mnt/HD/HD_a2/Public/x", "/Volume_1/Public/x"},
                                           {"/mnt/HD/HD_b2/P", "/Volume_2/P"},
                                           {"/mnt/HD/HD_a2", "/Volume_1/"},
                                           {"/mnt/HD/HD_a2/", "/Volume_1/"}})
        EXPECT_EQ(rsync_shared_path(path), shared) << path;
    for (const std::string path :
         {"/mnt/HD_a2/Public", "/mnt/HD/HD_d2/P", "/mnt/HD/HD_c2/P", "/mnt/HD/", "/mnt/HD/HD"})
        EXPECT_STREQ(rsync_shared_path(path), "") << path;
    EXPECT_STREQ(rsync_shared_path("/mnt/HD/HD_a2/" + std::string(1020, 'x')), "");
    for (const char *path : {"/mnt/HD/HD_a2/Public", "/mnt/HD/HD_a2", "/x/y/HD_b2"})
        EXPECT_EQ(rsync_volume_is_shared(path), 1) << path;
    for (const char *path : {"/mnt/HD/HD_x2/P", "/mnt/HD", "/mnt/HD/", ""})
        EXPECT_EQ(rsync_volume_is_shared(path), 0) << path;
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
