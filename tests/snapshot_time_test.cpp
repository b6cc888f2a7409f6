// By their times people tell snapshots apart.

#include "ctl_support.h"

#include <ctime>
#include <sys/stat.h>

namespace
{

std::time_t time_of(const std::string &path)
{
    struct stat status = {};
    return stat(path.c_str(), &status) == 0 ? status.st_mtim.tv_sec : -1;
}

TEST_F(Ctl, TheNewestSnapshotHasTheTimeOfItsRunAndTheOthersKeepTheirs)
{
    const std::string row = "/mnt/HD/HD_a2/Public/weekly.";
    ASSERT_TRUE(says(add("weekly", "backup_type=pull inc_enable=yes inc_number=3"), 0, ""));
    write_file("/remote/backup/S123_remote_backup/weekly/Public/f", "f");
    shell("touch --date=@2000 /remote/backup/S123_remote_backup/weekly/Public "
          "/remote/backup/S123_remote_backup/weekly/Public/f");
    for (int run = 0; run < 3; ++run) {
        const std::time_t before = std::time(nullptr);
        ASSERT_EQ(bakjob_program("-r weekly").status, 0);
        EXPECT_GE(time_of(row + "0"), before) << "not that of the folder over there";
        for (int older = 1; older <= run; ++older)
            EXPECT_EQ(time_of(row + std::to_string(older)), 3001 + run - older) << run;
        shell("touch --date=@" + std::to_string(3001 + run) + " " + row + "0");
    }
}

} // namespace
