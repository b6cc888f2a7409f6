// A configuration that cannot be written, and a run that must say so elsewhere.

#include "common/run_options.h"
#include "config/job_operations.h"
#include "config/job_state.h"
#include "config/unrecorded_state.h"
#include "ctl_support.h"

#include <filesystem>
#include <optional>
#include <sys/mount.h>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

constexpr const char *KEPT = "/var/run/bakjob_daily.unrecorded";

class UnrecordedState : public CtlDaily
{
protected:
    void SetUp() override
    {
        CtlDaily::SetUp();
        ASSERT_EQ(bakjob_program("-r daily").status, 0);
        ASSERT_TRUE(says(ctl("status"), 0, "done"));
    }

    void TearDown() override
    {
        unlock_configuration();
        CtlDaily::TearDown();
    }

    void lock_configuration() { read_only_.emplace("/etc/NAS_CFG"); }
    void unlock_configuration() { read_only_.reset(); }

private:
    std::optional<ReadOnly> read_only_;
};

TEST_F(UnrecordedState, AFailedRunNeverReadsAsDone)
{
    EXPECT_TRUE(says(ctl("check daily"), 0, "0 problems"));
    EXPECT_FALSE(exists(KEPT));
    fs::remove_all(SHARE);
    lock_configuration();
    EXPECT_TRUE(says(ctl("check daily"), 1, "configuration: it cannot be written, so no run can record"));
    EXPECT_TRUE(says(bakjob_program("-d -r daily"), 0, "state 4 of [daily] is not recorded"));
    EXPECT_EQ(octal_mode(KEPT), "600");
    const std::string words = "failed, not recorded: the configuration could not be written";
    EXPECT_TRUE(says(ctl("status"), 1, words));
    EXPECT_TRUE(says(ctl("list"), 0, words));
    EXPECT_TRUE(says(ctl("show daily"), 0, words));
    EXPECT_TRUE(says(ctl("show daily --json"), 0, "\"outcome\": \"failed\""));
    EXPECT_TRUE(says(ctl("watch daily"), 1, words));
    EXPECT_TRUE(says(ctl("check daily"), 1, "could not be written in a run, and does not say: failed"));

    unlock_configuration();
    EXPECT_TRUE(says(ctl("status"), 1, words)) << "until it is recorded";
    fs::create_directories(SHARE);
    ASSERT_EQ(bakjob_program("-r daily").status, 0);
    EXPECT_FALSE(exists(KEPT));
    EXPECT_TRUE(says(ctl("status"), 0, "done "));
    EXPECT_TRUE(says(ctl("check daily"), 0, "0 problems"));
}

TEST_F(UnrecordedState, BackupAndRestoreAreKeptApart)
{
    lock_configuration();
    ASSERT_EQ(bakjob_program("-k daily").status, 0);
    rsync_keep_unrecorded(named("daily"), StateKind::RESTORE, {JOB_FAILED, "then"});
    EXPECT_TRUE(says(ctl("status"), 1, "killed, not recorded"));
    EXPECT_TRUE(says(ctl("status"), 1, "restore failed, not recorded"));
    unlock_configuration();
    run_options.restore_mode = 1;
    rsync_set_job_state("daily", JOB_DONE);
    EXPECT_TRUE(says(ctl("status"), 1, "killed, not recorded"));
    EXPECT_TRUE(says(ctl("status"), 1, "restore done  "));
    run_options.restore_mode = 0;
    rsync_set_job_state("daily", JOB_DONE);
    EXPECT_FALSE(exists(KEPT));
}

TEST_F(UnrecordedState, AClaimOfARunIsBelievedOnlyWhileThereIsOne)
{
    lock_configuration();
    rsync_set_job_state("daily", JOB_STARTING);
    EXPECT_TRUE(says(ctl("status"), 1, "interrupted, not recorded"));
    unlock_configuration();
    rsync_set_job_state("daily", JOB_RUNNING);
    lock_configuration();
    EXPECT_TRUE(says(bakjob_program("-d -a"), 0, "stale states are not reset"));
    unlock_configuration();
    EXPECT_EQ(bakjob_program("-a").status, 0);
    EXPECT_EQ(job_key(1, "state"), "8");

    write_file("/tmp/planted", "state 2 then\n");
    fs::create_symlink("/tmp/planted", KEPT);
    EXPECT_TRUE(says(ctl("status"), 1, "interrupted"));
    rsync_keep_unrecorded(named("daily"), StateKind::BACKUP, {JOB_KILLED, "now"});
    EXPECT_EQ(read_file("/tmp/planted"), "state 2 then\n");
    for (const char *damaged : {"", "state", "state x then\n", "state 2x then\n", "rstate\nstate \n"}) {
        write_file(KEPT, damaged);
        EXPECT_TRUE(says(ctl("status"), 1, "interrupted")) << damaged;
    }
}

TEST_F(UnrecordedState, AResetTakesOverTheEndThatWasKept)
{
    rsync_set_job_state("daily", JOB_RUNNING);
    rsync_keep_unrecorded(named("daily"), StateKind::BACKUP, {JOB_FAILED, "then"});
    EXPECT_EQ(bakjob_program("-a").status, 0);
    EXPECT_EQ(job_key(1, "state") + job_key(1, "last_do_job_time"), "4then");
    EXPECT_FALSE(exists(KEPT));
}

TEST_F(UnrecordedState, FollowsItsJobToAnotherNameAndGoesWithIt)
{
    const bakjob::UnrecordedState failed{JOB_FAILED, "then"};
    const auto kept = [](const char *name) {
        return rsync_unrecorded_state(named(name), StateKind::BACKUP).has_value();
    };
    rsync_add_job(make_job("other"));
    rsync_keep_unrecorded(named("daily"), StateKind::BACKUP, failed);
    rsync_keep_unrecorded(named("new"), StateKind::RESTORE, failed); // an earlier job's
    lock_configuration();
    rsync_modify_job(make_job("new"), "daily");
    EXPECT_TRUE(kept("daily")) << "the name is not written";
    unlock_configuration();
    rsync_modify_job(make_job("new"), "daily");
    EXPECT_TRUE(kept("new") && !exists(KEPT));
    EXPECT_FALSE(rsync_unrecorded_state(named("new"), StateKind::RESTORE));

    rsync_keep_unrecorded(named("other"), StateKind::BACKUP, failed);
    rsync_delete_job("new");
    EXPECT_FALSE(kept("new"));
    rsync_add_job(make_job("last"));
    rsync_keep_unrecorded(named("last"), StateKind::BACKUP, {JOB_KILLED, "now"});
    rsync_modify_job(make_job("other"), "last");
    EXPECT_FALSE(kept("last"));
    EXPECT_EQ(rsync_unrecorded_state(named("other"), StateKind::BACKUP)->state, JOB_FAILED)
        << "that of the first job of the name";
}

TEST_F(UnrecordedState, ACheckFindsThatThereIsNoRoomForAnotherCopy)
{
    const std::string config = read_file(STORE);
    ASSERT_EQ(mount("none", "/etc/NAS_CFG", "tmpfs", 0, "size=64k"), 0);
    write_file(STORE, config);
    EXPECT_TRUE(says(ctl("check daily"), 0, "0 problems"));
    shell("head -c 1M /dev/zero >/etc/NAS_CFG/filler 2>/dev/null");
    EXPECT_TRUE(says(ctl("check daily"), 1, "/etc/NAS_CFG: no room for another copy"));
    umount2("/etc/NAS_CFG", MNT_DETACH);
}

} // namespace
