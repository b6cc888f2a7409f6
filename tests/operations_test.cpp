// The job operations that the module offers to other parts of the appliance.

#include "common/text.h"
#include "config/job_list.h"
#include "config/job_operations.h"
#include "support.h"

using namespace bakjob;

class Operations : public Appliance
{
protected:
    static std::string names()
    {
        std::string all;
        const int count = std::max(0, std::atoi(store_get("/backup_mgr/rsync/count").c_str()));
        for (int i = 1; i <= count; ++i)
            all += job_key(i, "job_name") + job_key(i, "enable") + " ";
        return all;
    }
};

constexpr const char *COUNT = "/system_mgr/crond/rsync/count";

TEST_F(Operations, EachIsAWholeCycleThatLeavesNoList)
{
    EXPECT_EQ(rsync_job_exists("a"), 0);
    for (const char *name : {"a", "b", "c"})
        EXPECT_EQ(rsync_add_job(make_job(name)), 1);
    EXPECT_EQ(rsync_add_job(make_job("b")), 0);
    EXPECT_EQ(rsync_disable_job("b"), 1);
    EXPECT_EQ(names(), "a1 b0 c1 ");
    EXPECT_EQ(rsync_enable_job("b"), 1);
    EXPECT_EQ(rsync_job_exists("b"), 1);
    EXPECT_EQ(rsync_delete_job("a"), 1);
    EXPECT_EQ(names(), "b1 c1 ");
    const std::string before = read_file(STORE);
    RsyncJob untouched = make_job("mine");
    for (const int result : {rsync_enable_job("x"), rsync_disable_job("x"), rsync_delete_job("x"),
                             rsync_get_job(untouched, "x"), rsync_modify_job(make_job("y"), "x")})
        EXPECT_EQ(result, 0);
    EXPECT_STREQ(untouched.job_name, "mine");
    EXPECT_EQ(read_file(STORE), before);
    EXPECT_EQ(rsync_get_job(untouched, "c"), 1);
    EXPECT_STREQ(untouched.job_name, "c");
    EXPECT_EQ(rsync_job_list_empty(), 1);
    EXPECT_FALSE(exists(FLASH)) << "flash is not theirs to write";
}

TEST_F(Operations, RenamingOntoAnotherNameKeepsTheFirstAtTheNextLoad)
{
    for (const char *name : {"a", "b"})
        rsync_add_job(make_job(name));
    RsyncJob renamed = make_job("a");
    renamed.pwd_encoded = 0;
    copy_text(renamed.rsync_pwd, "plain");
    copy_text(renamed.user_description, "was b");
    EXPECT_EQ(rsync_modify_job(renamed, "b"), 1);
    EXPECT_EQ(names(), "a1 a1 ");
    EXPECT_EQ(job_key(2, "rsync_pwd"), "plain") << "as given, until the next load and save";
    EXPECT_EQ(rsync_enable_job("a"), 1);
    EXPECT_EQ(names(), "a1 ");
    EXPECT_EQ(job_key(1, "user_description"), "");
    EXPECT_EQ(rsync_modify_job(renamed, "a"), 1);
    EXPECT_EQ(rsync_disable_job("a"), 1);
    EXPECT_EQ(job_key(1, "rsync_pwd"), "cGxhaW4=");
}

TEST_F(Operations, SchedulerEntriesFollowTheJobs)
{
    for (const char *name : {"a", "ab"}) {
        RsyncJob job = make_job(name);
        job.schedule_mode = 1;
        rsync_add_job(job);
    }
    set_schedule({"bakjob -r 'ab'", "bakjob -r 'a'"});
    RsyncJob job = make_job("a");
    job.schedule_mode = 2;
    rsync_modify_job(job, "a");
    EXPECT_EQ(store_get(COUNT), "2") << "what it had was a timetable";
    rsync_modify_job(job, "a");
    EXPECT_EQ(store_get(COUNT), "1") << "the first entry that holds the name";
    EXPECT_EQ(store_get("/system_mgr/crond/rsync/item:1/run"), "bakjob -r 'a'");
    rsync_delete_job("ab");
    EXPECT_EQ(store_get(COUNT), "1");
    rsync_delete_job("a");
    EXPECT_EQ(store_get("/system_mgr/crond/list/count"), "0");
    EXPECT_EQ(store_get("/backup_mgr/rsync/count"), "(none)");
}
