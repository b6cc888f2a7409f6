#include "common/job_files.h"
#include "common/run_options.h"
#include "support.h"
#include "transfer/snapshot.h"

#include <filesystem>
#include <sys/stat.h>
#include <utime.h>

using namespace bakjob;
namespace fs = std::filesystem;

class Snapshot : public Appliance
{
protected:
    inline static const std::string FOLDER = "/mnt/HD/My Photos (1)";

    static void make(const std::string &name, int number)
    {
        const std::string path = FOLDER + "/" + snapshot_name(name, number);
        write_file(path + "/file", "of " + std::to_string(number));
        const utimbuf times{.actime = 1000 + number, .modtime = 2000 + number};
        utime(path.c_str(), &times);
    }

    // The row as "NUMBER=CONTENT@TIME " of each snapshot there is.
    static std::string row(const std::string &name)
    {
        std::string all;
        for (int number = 0; number <= 11; ++number) {
            const std::string path = FOLDER + "/" + snapshot_name(name, number);
            struct stat status = {};
            if (stat(path.c_str(), &status) != 0) continue;
            all += std::to_string(number) + "=" + read_file(path + "/file").substr(3) + "@" +
                   std::to_string(status.st_mtime) + " ";
        }
        return all;
    }
};

TEST_F(Snapshot, TheRowMovesUpAndKeepsItsTimes)
{
    for (const std::string name : {"daily", "it's $x `y`", ""}) {
        SetUp();
        for (int number = 0; number <= 3; ++number)
            make(name, number);
        rsync_snapshot_rotate(FOLDER, 4, name);
        EXPECT_EQ(row(name), "0=0@2000 1=0@2000 2=1@2001 3=2@2002 ") << name;
        const auto path = [&](int number) { return FOLDER + "/" + snapshot_name(name, number); };
        EXPECT_EQ(run_options.inc_root_path, path(0));
        EXPECT_TRUE(fs::equivalent(path(0) + "/file", path(1) + "/file"));
        EXPECT_FALSE(fs::equivalent(path(1) + "/file", path(2) + "/file"));
        EXPECT_EQ(std::distance(fs::directory_iterator(FOLDER), fs::directory_iterator()), 4);
    }
}

TEST_F(Snapshot, LengthIsBoundedAndGapsMoveUp)
{
    for (int number = 0; number <= 9; ++number)
        make("j", number);
    rsync_snapshot_rotate(FOLDER, 25, "j");
    EXPECT_TRUE(row("j").starts_with("0=0@2000 1=0@2000 2=1@2001 ")) << row("j");
    EXPECT_TRUE(row("j").ends_with("9=8@2008 ")) << row("j");

    SetUp();
    make("j", 0);
    make("j", 2);
    rsync_snapshot_rotate(FOLDER, 1, "j");
    EXPECT_EQ(row("j"), "0=0@2000 1=0@2000 ");

    SetUp();
    fs::create_directories(FOLDER);
    rsync_snapshot_rotate(FOLDER, 3, "j");
    EXPECT_EQ(row("j"), "");
    EXPECT_EQ(run_options.inc_root_path, FOLDER + "/j.0");
}

TEST_F(Snapshot, NamesThatCannotBeQuotedMoveNothing)
{
    run_options.debug_mode = 1;
    for (const auto &[folder, name] : Keys{{"", "j"}, {"/mnt/HD/a\"b", "j"}, {FOLDER, "a/../b"}})
        EXPECT_FALSE(
            has(printed_by([&path = folder, &job = name] { rsync_snapshot_rotate(path, 3, job); }), "[rm"))
            << folder;
    EXPECT_EQ(rotation_command("/a", "j", 2, 2), "rm -rf /a/j.2");
    EXPECT_EQ(rotation_command("/a", "j", 1, 2), "mv /a/j.1 /a/j.2");
    EXPECT_EQ(rotation_command("/a", "", 0, 2), "cp -al /a/backup.0 /a/backup.1");
}
