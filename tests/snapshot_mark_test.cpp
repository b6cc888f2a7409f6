// Which snapshots are known to be whole, whatever becomes of the commands that move them up.

#include "ctl_support.h"
#include "transfer/snapshot_mark.h"

#include <filesystem>
#include <sys/xattr.h>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

const std::string REMOTE = "/remote/backup/S1_remote_backup/weekly/Public/";

std::string snapshot(int number)
{
    return SHARE + "/weekly." + std::to_string(number);
}

class SnapshotMark : public Ctl
{
protected:
    void SetUp() override
    {
        Ctl::SetUp();
        if (!mark_whole(SHARE)) GTEST_SKIP() << "no extended attributes of root's here";
        ASSERT_TRUE(says(add("weekly", "backup_type=pull inc_enable=yes inc_number=4"), 0, ""));
        for (const char *name : {"a", "sub/b", "sub/c"})
            write_file(REMOTE + name, "of the first run");
    }

    static Ran run() { return bakjob_program("-d -r weekly"); }

    static void make_row()
    {
        for (int number = 0; number < 4; ++number) {
            shell("cp -r " + REMOTE + " " + snapshot(number));
            mark_whole(snapshot(number));
        }
        ASSERT_EQ(row(), "0w 1w 2w 3w");
    }

    // "0w 1 2w": which there are, and which of them are marked.
    static std::string row()
    {
        std::string all;
        for (int number = 0; number < 5; ++number) {
            if (!exists(snapshot(number))) continue;
            all += (all.empty() ? "" : " ") + std::to_string(number) +
                   (is_marked_whole(snapshot(number)) ? "w" : "");
        }
        return all;
    }
};

TEST_F(SnapshotMark, GoesWithTheSnapshotAndNotWithATransferThatFailed)
{
    for (const char *expected : {"0w", "0w 1w", "0w 1w 2w", "0w 1w 2w 3w", "0w 1w 2w 3w"}) {
        const Ran ran = run();
        EXPECT_EQ(row(), expected);
        EXPECT_FALSE(has(ran.output, "ERROR")) << ran.output;
    }
    const auto run_that_ends = [](const std::string &kind, int code) {
        const Fake rsync(RSYNC, KIND_OF_CALL + "[ $kind != " + kind + " ] || exit " + std::to_string(code) +
                                    "\nexec /usr/sbin/rsync.real \"$@\"\n");
        run();
    };
    run_that_ends("run", 12);
    run_that_ends("run", 23);
    EXPECT_EQ(row(), "0 1 2w 3w");
    run();
    EXPECT_EQ(row(), "0w 1 2 3w");
    run_that_ends("dry", 12);
    EXPECT_EQ(row(), "0w 1w 2 3") << "nothing was written";
    const Ran table = ctl("snapshots weekly");
    EXPECT_TRUE(says(table, 0, "yes        /mnt/HD/HD_a2/Public/weekly.1  bakjob -n 2 -r weekly\n"));
    EXPECT_FALSE(has(table.output, "-n 3")) << "not offered";
    EXPECT_TRUE(says(ctl("snapshots --json weekly"), 0, "\"complete\": false,\n    \"recover\": null"));
    EXPECT_TRUE(says(ctl("check weekly"), 0, "not known to be complete: weekly.2, weekly.3\n"));
}

TEST_F(SnapshotMark, IsNotLeftByAStepThatFailedOrDiedWithItsRun)
{
    struct Case {
        std::string program;
        std::string script; // behind it the program itself is run
        std::string row;
        std::string trace;
    };
    const std::string moving = "case $1 in *weekly.1) ";
    const std::string die = "kill -9 $(cat /var/run/bakjob_weekly.pid); exit\n";
    const std::vector<Case> cases = {
        {"cp", "/bin/cp \"$@\"; rm $3/sub/b; exit 1\n", "0w 1 2w 3w", "[cp -al "},
        {"cp", "/bin/cp \"$@\"; rm $3/sub/b; kill -9 $$\n", "0w 1 2w 3w", "exit code 137"},
        {"mv", moving + "exit 1 ;; esac\n", "0w 1 3w", "[mv "},
        {"mv", moving + "cp -a $1 $2; rm $2/a $1/sub/c; exit 1 ;; esac\n", "0w 1 2 3w", "[mv "},
        {"mv", moving + "mkdir $2 ;; esac\n", "0w 1w 2 3w", ""},
        {"rm", "exit 1\n", "0w 1w 2w 3", "[rm -rf "},
        {"rm", "exit 0\n", "0w 1w 2w 3", "its target was there"},
        {"rm", "/bin/rm -r $2/sub; " + die, "0w 1w 2w 3", ""},
        {"mv", "cp -a $1 $2; /bin/rm -r $1/sub; " + die, "0w 1w 2 3", ""}, // between file systems
        {"cp", "/bin/cp \"$@\"; rm $3/sub/b; " + die, "0w 1 2w 3w", ""}};
    for (const Case &c : cases) {
        SetUp();
        make_row();
        const Fake broken("/usr/local/bin/" + c.program, c.script + "exec /bin/" + c.program + " \"$@\"\n");
        const Ran ran = run();
        EXPECT_EQ(row(), c.row) << c.program << c.script << ran.output;
        if (c.script.ends_with(die)) continue;
        const bool copied = lgetxattr(snapshot(1).c_str(), SNAPSHOT_MARK, nullptr, 0) >= 0;
        EXPECT_FALSE(c.program == "cp" && copied) << "nor that of the source";
        EXPECT_TRUE(has(ran.output, "ERROR: snapshots: "));
        EXPECT_TRUE(has(ran.output, c.trace));
        EXPECT_EQ(job_key(1, "state"), "2") << "the newest is whole";
    }
}

TEST_F(SnapshotMark, ThatCannotBeTakenAwayEndsTheFolder)
{
    run();
    write_file(REMOTE + "new", "x");
    const ReadOnly mounted(snapshot(0));
    EXPECT_TRUE(has(run().output, "still marked as complete: Read-only file system"));
    EXPECT_EQ(job_key(1, "state"), "4");
}

TEST_F(SnapshotMark, IsOfItsFolderAlone)
{
    run();
    shell("cp -a " + snapshot(0) + " " + snapshot(3));
    EXPECT_EQ(row(), "0w 3") << "a copy may be a part";
    fs::create_directory_symlink(snapshot(0), snapshot(2));
    EXPECT_FALSE(mark_whole(snapshot(2)));
    EXPECT_FALSE(take_mark_away(snapshot(2)) || take_mark_away(snapshot(4)));
    EXPECT_TRUE(is_marked_whole(snapshot(0)));
}

TEST_F(SnapshotMark, IsMissedWithoutExtendedAttributesAndRunsGoOn)
{
    shell("mount -t ramfs share " + SHARE);
    EXPECT_FALSE(keeps_marks(SHARE));
    const std::string trace = run().output + run().output;
    EXPECT_EQ(row(), "0 1");
    EXPECT_TRUE(says(ctl("snapshots weekly"), 0, "not known"));
    EXPECT_TRUE(says(ctl("check weekly"), 0, "its file system keeps no extended attributes"));
    shell("umount " + SHARE);
    EXPECT_FALSE(has(trace, "ERROR")) << trace;
    EXPECT_EQ(job_key(1, "state"), "2");
}

} // namespace
