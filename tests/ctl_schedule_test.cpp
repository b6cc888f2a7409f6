// Timetables: the configuration and the scheduler say the same, or people are told.

#include "config/job_operations.h"
#include "config/schedule.h"
#include "ctl_support.h"

#include <filesystem>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

constexpr const char *OF_DAILY = "0 3 * * * root /usr/sbin/bakjob -r 'daily'\n";

class CtlSchedule : public CtlDaily
{
protected:
    static Ran schedule() { return ctl("schedule daily '0 3 * * *'"); }
};

TEST_F(CtlSchedule, AJobHasOneTimetableAndKeepsItToItself)
{
    for (const char *name : {"\"it's 100%\"", "dailyy"}) {
        ASSERT_TRUE(says(add(name), 0, ""));
        ASSERT_TRUE(says(ctl("schedule " + std::string(name) + " '1 2 * * *'"), 0, ""));
    }
    for (const char *first : {"1 2 * * *", "*/5 0-6/2,23 1 JAN,7 mon-5"})
        ASSERT_TRUE(says(ctl("schedule daily '" + std::string(first) + "'"), 0, ""));
    const std::string of_others = "1 2 * * * root /usr/sbin/bakjob -r 'it'\\''s 100\\%' # 'it's 100\\%'\n"
                                  "1 2 * * * root /usr/sbin/bakjob -r 'dailyy'\n";
    EXPECT_EQ(read_file(CRON), of_others + "*/5 0-6/2,23 1 JAN,7 mon-5 root /usr/sbin/bakjob -r 'daily'\n");
    EXPECT_TRUE(says(ctl("show daily"), 0, "timetable             */5 0-6/2,23 1 JAN,7 mon-5"));

    EXPECT_EQ(job_key(1, "schedule_mode"), "1");
    EXPECT_EQ(read_file(FLASH), read_file(STORE));
    ASSERT_TRUE(says(ctl("unschedule daily"), 0, ""));
    ASSERT_TRUE(says(ctl("set daily schedule_mode=once"), 0, ""));
    EXPECT_EQ(read_file(CRON), of_others);
    for (const char *name : {"dailyy", "\"it's 100%\""})
        ASSERT_TRUE(says(ctl(std::string("delete ") + name), 0, ""));
    EXPECT_EQ(read_file(CRON), "");
    EXPECT_EQ(ctl("list --names").output, "daily\n");
}

TEST_F(CtlSchedule, WhatTheSchedulerDidNotTakeIsToldAndHandedOverByTheSameCommand)
{
    {
        const ReadOnly cron("/etc/cron.d");
        EXPECT_TRUE(says(schedule(), 3, "in the configuration, but the scheduler did not take it over"));
        EXPECT_TRUE(
            says(ctl("check daily"), 1, "problem  timetable: the scheduler has not taken it over: 0 3"));
        EXPECT_TRUE(says(ctl("check daily"), 1, "bakjobctl schedule daily \"0 3 * * *\""));
    }
    EXPECT_TRUE(says(schedule(), 0, ""));
    EXPECT_TRUE(says(ctl("check daily"), 0, "0 problems"));
    {
        const ReadOnly cron("/etc/cron.d");
        EXPECT_TRUE(says(ctl("unschedule daily"), 3, "no longer in the configuration"));
    }
    EXPECT_TRUE(
        says(ctl("check daily"), 1, "the scheduler still has an entry that is not there any more: 0 3"));
    EXPECT_TRUE(says(ctl("unschedule daily"), 0, ""));
    EXPECT_TRUE(says(ctl("check daily"), 0, "0 problems"));
    EXPECT_TRUE(says(ctl("unschedule daily"), 3, "the job has no timetable"));

    ASSERT_TRUE(says(schedule(), 0, ""));
    const ReadOnly cron("/etc/cron.d");
    EXPECT_TRUE(says(ctl("delete daily"), 3, "the job is deleted, but the scheduler"));
    EXPECT_EQ(ctl("list --names").output, "");
}

TEST_F(CtlSchedule, TheSchedulerGoesByTheFileWhenASaveOrTheFlashFails)
{
    ASSERT_TRUE(says(schedule(), 0, ""));
    // Gone with the next save, by which the scheduler is told before the file is written.
    store_set("/system_mgr/crond/rsync/count", "2");
    store_set("/system_mgr/crond/rsync/item:2/run", "/usr/sbin/bakjob -r 'nobody'");
    store_save();
    const std::string before = read_file(STORE);
    {
        const ReadOnly config("/etc/NAS_CFG");
        for (const char *change :
             {"set daily retry=1", "delete daily", "schedule daily '9 9 * * *'", "unschedule daily"}) {
            EXPECT_EQ(ctl(change).status, 3) << change;
            EXPECT_EQ(read_file(CRON), OF_DAILY) << change;
        }
        EXPECT_EQ(rsync_delete_job("daily"), 1);
        EXPECT_EQ(read_file(CRON), OF_DAILY) << "the job is still there, and so is its timetable";
    }
    EXPECT_EQ(read_file(STORE), before);
    fs::remove_all("/var/lib/device_flash");
    write_file("/var/lib/device_flash", "no folder");
    EXPECT_TRUE(says(ctl("schedule daily '9 9 * * *'"), 3, "could not be copied to flash"));
    EXPECT_TRUE(says(ctl("set daily retry=1"), 3, "could not be copied to flash"));
    EXPECT_EQ(read_file(CRON), "9 9 * * * root /usr/sbin/bakjob -r 'daily'\n");
    fs::remove("/var/lib/device_flash");
}

TEST_F(CtlSchedule, ACheckComparesWithTheSchedulersFile)
{
    ASSERT_TRUE(says(add("\"it's 100%\""), 0, ""));
    ASSERT_TRUE(says(add("it"), 0, ""));
    ASSERT_TRUE(says(ctl("schedule \"it's 100%\" '1 2 * * *'"), 0, ""));
    for (const char *name : {"it", "\"it's 100%\""})
        EXPECT_TRUE(says(ctl(std::string("check ") + name), 0, "0 problems"));

    const std::string cron = read_file(CRON);
    write_file(CRON, cron + "5 5 * * * root /usr/sbin/bakjob -r 'dail'\n5 6 * * * root x 'it'\n");
    EXPECT_TRUE(says(ctl("check daily"), 0, "0 problems"));
    EXPECT_TRUE(says(ctl("check it"), 1, "bakjobctl unschedule it takes it away"));
    write_file(CRON, "");
    EXPECT_TRUE(says(ctl("check \"it's 100%\""), 1, "has not taken it over: 1 2 * * * root"));
    fs::remove(CRON);
    EXPECT_EQ(ctl("check \"it's 100%\"").status, 1);
    shell("mv /etc/cron.d /etc/cron.d.away");
    EXPECT_TRUE(says(ctl("check \"it's 100%\""), 0, "0 problems")) << "another scheduler's device";
    shell("mv /etc/cron.d.away /etc/cron.d");
}

TEST_F(CtlSchedule, AnEntryNeverTakesTheNumberOfOneThatACountLeavesOut)
{
    const ScheduleEntry entry{"1", "2", "*", "*", "*", "root", "/usr/sbin/bakjob -r 'daily'"};
    ASSERT_TRUE(rsync_add_schedule(entry));
    EXPECT_EQ(store_get("/system_mgr/crond/list/name:1"), "rsync");
    store_save();
    for (const char *count : {"/system_mgr/crond/rsync/count", "/system_mgr/crond/list/count"}) {
        const std::string before = store_get(count);
        for (const char *damaged : {"0", "-1", "2000000000"}) {
            store_set(count, damaged);
            EXPECT_FALSE(rsync_add_schedule(entry)) << count << damaged;
            EXPECT_EQ(store_get(count), damaged);
        }
        store_set(count, before);
    }
    EXPECT_EQ(store_get("/system_mgr/crond/rsync/item:2/run"), "(none)");
    store_set("/system_mgr/crond/rsync/count", "0");
    store_save();
    const std::string damaged = read_file(STORE);
    EXPECT_TRUE(says(schedule(), 3, "nothing is changed"));
    EXPECT_EQ(read_file(STORE), damaged);
}

TEST_F(CtlSchedule, DeleteTakesAwayWhatTheJobLeft)
{
    const std::vector<std::string> left = {"/tmp/r_daily.passwd", "/tmp/rsync_bakcup_src_folder_name.daily",
                                           "/tmp/r_daily", "/tmp/r_daily.dump_size",
                                           "/var/run/bakjob_daily.unrecorded"};
    for (const std::string &path : left)
        write_file(path, "state 4 -\n");
    write_file("/tmp/r_daily2.passwd", "another job's");
    {
        const ReadOnly config("/etc/NAS_CFG");
        EXPECT_EQ(ctl("delete daily").status, 3);
        EXPECT_TRUE(exists(left.back())) << "the job is still there";
    }
    EXPECT_TRUE(says(ctl("delete daily"), 0, ""));
    for (const std::string &path : left)
        EXPECT_FALSE(exists(path)) << path;
    EXPECT_TRUE(exists("/tmp/r_daily2.passwd"));
    EXPECT_TRUE(exists(SHARE + "/file"));

    write_file(left.back(), "state 4 -\n");
    ASSERT_TRUE(says(add("daily"), 0, ""));
    EXPECT_TRUE(says(ctl("status daily"), 0, "never ran")) << "a job of this name before is not this one";
}

} // namespace
