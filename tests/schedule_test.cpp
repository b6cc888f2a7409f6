#include "config/job_list.h"
#include "config/job_store.h"
#include "config/schedule.h"
#include "platform/config_store.h"
#include "platform/scheduler.h"
#include "support.h"

using namespace bakjob;

class Schedule : public Appliance
{
protected:
    // The group "rsync" stands between two others.
    static void set_entries(const std::vector<std::string> &commands)
    {
        store_set("/system_mgr/crond/list/count", "1");
        store_set("/system_mgr/crond/list/name:1", "first");
        set_schedule(commands);
        store_set("/system_mgr/crond/list/count", "3");
        store_set("/system_mgr/crond/list/name:3", "last");
        store_save();
    }

    static std::string entries()
    {
        std::string all;
        const int count = xml_get_int("/system_mgr/crond/rsync/count");
        for (int i = 1; i <= count; ++i)
            all += store_get("/system_mgr/crond/rsync/item:" + std::to_string(i) + "/run") + "|";
        return all;
    }

    static std::string groups()
    {
        return store_get("/system_mgr/crond/list/count") + ":" + store_get("/system_mgr/crond/list/name:1") +
               "," + store_get("/system_mgr/crond/list/name:2") + "," +
               store_get("/system_mgr/crond/list/name:3");
    }

    // The file is written exactly when the scheduler was told.
    static bool committed() { return exists(CRON); }
};

TEST_F(Schedule, PruningKeepsExactlyTheEntriesThatNameAJob)
{
    struct Case {
        std::vector<std::string> jobs;
        std::vector<std::string> commands;
        std::string left;
    };
    const std::string long_name(127, 'n');
    const std::string filler(300, 'x');
    const std::vector<std::string> long_ones = {std::string(255, 'x'), filler + "'a'", filler + "'b'",
                                                filler + filler + "'" + filler, "-r 'b'"};
    const std::string unjudged(1U << 20U, '\'');
    const std::vector<Case> cases = {
        {{"a", "b"}, {"-r 'a'", "-r 'c'", "-r 'b'"}, "-r 'a'|-r 'b'|"},
        {{"a"}, {"-r 'x'", "-r 'y'", "-r 'a'", "-r 'z'"}, "-r 'a'|"},
        {{}, {"-r 'a'", "-r 'c'", "-r 'b'"}, ""},
        {{"a"}, {"-r 'a'"}, "-r 'a'|"},
        {{"ab"}, {"-r 'abc'", "-r 'ab'"}, "-r 'ab'|"},
        {{long_name}, {"-r '" + long_name + "'", "-r 'x'"}, "-r '" + long_name + "'|"},
        {{"a"}, {}, ""},
        {{"a"}, long_ones, filler + "'a'|"},
        {{"a"}, {filler + "'b'"}, ""},
        {{"a"}, {unjudged, "-r 'b'"}, unjudged.substr(0, 4095) + "|"}};
    for (const Case &one : cases) {
        SetUp();
        set_entries(one.commands);
        const std::string before = entries();
        rsync_load_jobs();
        for (const std::string &name : one.jobs)
            rsync_list_add_job(make_job(name));
        rsync_save_jobs();
        EXPECT_EQ(entries(), one.left);
        EXPECT_EQ(groups(),
                  one.left.empty() && !before.empty() ? "2:first,last,(none)" : "3:first,rsync,last");
        EXPECT_EQ(committed(), one.left != before) << one.left;
    }
}

TEST_F(Schedule, RemovingAJobsEntryTakesTheFirstThatHoldsItsName)
{
    set_entries({"-r 'x'", "-r 'abc'", "-r 'ab'"});
    rsync_remove_job_schedule("ab");
    EXPECT_EQ(entries(), "-r 'x'|-r 'ab'|");
    EXPECT_TRUE(committed());

    SetUp();
    set_entries({"-r 'abc'"});
    rsync_remove_job_schedule("ab");
    EXPECT_EQ(groups(), "2:first,last,(none)");
    EXPECT_TRUE(committed());

    SetUp();
    set_entries({"-r 'x'", "-r 'y'"});
    rsync_remove_job_schedule("ab");
    EXPECT_EQ(entries(), "-r 'x'|-r 'y'|");
    EXPECT_FALSE(committed());
}

TEST_F(Schedule, AnEntryIsCreatedForTheSchedulerAndTheGroupDeleted)
{
    rsync_create_schedule("5", "2", "*", "*", "1", "root", "/usr/sbin/bakjob -r '100%'");
    rsync_create_schedule("6", "2", "*", "*", "1", "root", "/usr/sbin/bakjob -r 'b'");
    EXPECT_EQ(entries(), "/usr/sbin/bakjob -r '100%'|/usr/sbin/bakjob -r 'b'|");
    EXPECT_TRUE(has(read_file(CRON), "5 2 * * 1 root /usr/sbin/bakjob -r '100\\%'\n"));
    for (const char *list : {"/system_mgr/crond/rsync/count", "/system_mgr/crond/list/count"})
        store_set(list, "2147483647");
    EXPECT_EQ(LIB_do_ctc(), 0) << "ends with the entries that are there, whatever the count says";
    EXPECT_EQ(lines_of(read_file(CRON)).size(), 2U);
    store_set("/system_mgr/crond/rsync/count", "2");
    store_set("/system_mgr/crond/list/count", "1");
    rsync_delete_schedule();
    EXPECT_EQ(entries(), "");
    EXPECT_FALSE(has(read_file(CRON), "bakjob -r"));
}
