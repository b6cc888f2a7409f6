#include "common/text.h"
#include "config/current_job.h"
#include "config/job_list.h"
#include "config/job_store.h"
#include "support.h"

using namespace bakjob;

using JobList = Appliance;

namespace
{

std::string names()
{
    std::string all;
    for (const RsyncJob *job = job_list->head; job != nullptr; job = job->next)
        all += job->job_name + std::string(" ");
    return all;
}

} // namespace

TEST_F(JobList, KeepsOrderAndTail)
{
    for (const auto &[name, added] : {std::pair("a", 1), {"b", 1}, {"a", 0}, {"c", 1}})
        EXPECT_EQ(rsync_list_add_job(make_job(name)), added) << name;
    EXPECT_EQ(names(), "a b c ");
    EXPECT_EQ(rsync_find_job("B"), nullptr);
    EXPECT_EQ(rsync_find_job("b "), nullptr);
    RsyncJob stranger{};
    EXPECT_EQ(rsync_list_remove_job(&stranger), 0);
    EXPECT_EQ(rsync_list_remove_job(nullptr), 0);
    EXPECT_EQ(rsync_list_remove_job(rsync_find_job("c")), 1);
    rsync_list_add_job(make_job("d"));
    EXPECT_EQ(rsync_list_remove_job(rsync_find_job("a")), 1);
    EXPECT_EQ(names(), "b d ");
    rsync_list_remove_job(rsync_find_job("d"));
    rsync_list_remove_job(rsync_find_job("b"));
    EXPECT_EQ(rsync_job_list_empty(), 1);
    rsync_list_add_job(make_job("e"));
    EXPECT_EQ(job_list->head, job_list->tail);
    EXPECT_EQ(job_list->count, 1);
}

TEST_F(JobList, PasswordsAreEncodedOnceAndNeverLost)
{
    const std::string fits(93, 'p');
    const std::string too_long(94, 'p');
    struct Case {
        int pwd_encoded;
        int use_ssh;
        std::string rsync_pwd;
        std::string ssh_pwd;
        int encoded_after;
        std::string rsync_after;
        std::string ssh_after;
    };
    const std::vector<Case> cases = {
        {0, 0, "pw", "ssh", 1, "cHc=", "ssh"},
        {0, 1, "pw", "ssh", 1, "cHc=", "c3No"},
        {0, 1, "", "ssh", 1, "cGFrdG8=", "c3No"},
        {1, 1, "cHc=", "c3No", 1, "cHc=", "c3No"},
        {-1, 1, "cHc=", "c3No", 1, "cHc=", "c3No"},
        {1, 1, "", "c3No", 1, "cGFrdG8=", "c3No"}, // must not be encoded twice
        {0, 1, fits, "ssh", 1, std::string(), "c3No"},
        {0, 1, too_long, "ssh", 0, too_long, "ssh"},
        {0, 1, "pw", too_long, 0, "pw", too_long},
        {0, 0, "pw", too_long, 1, "cHc=", too_long},
    };
    for (const Case &one : cases) {
        RsyncJob job = make_job("j");
        job.pwd_encoded = one.pwd_encoded;
        job.use_ssh = one.use_ssh;
        ASSERT_TRUE(copy_text(job.rsync_pwd, one.rsync_pwd) && copy_text(job.ssh_pwd, one.ssh_pwd));
        job.port[0] = '\0';
        ASSERT_EQ(rsync_list_add_job(job), 1);
        const RsyncJob &added = *job_list->head;
        EXPECT_EQ(added.pwd_encoded, one.encoded_after);
        if (!one.rsync_after.empty()) {
            EXPECT_EQ(added.rsync_pwd, one.rsync_after);
        }
        EXPECT_EQ(added.ssh_pwd, one.ssh_after);
        EXPECT_STREQ(added.port, "873");
        rsync_free_jobs();
    }
}

TEST_F(JobList, TheStoreKeepsEveryFieldAndNumbersFromOne)
{
    add_job(
        {{"job_name", "one"}, {"rsync_pwd", "pw"}, {"user_description", " <&\"'> \n x "}, {"rstate", "7"}});
    add_job({{"job_name", "two"}, {"use_ssh", "1"}, {"ssh_pwd", "ssh"}});
    add_job({{"job_name", "one"}, {"remote_path", "second of the name"}});
    add_job({{"job_name", "three"}, {"in_remote_cloud_fqdn", "cloud"}, {"rlast_do_job_time", "then"}});
    rsync_load_jobs();
    EXPECT_EQ(names(), "one two three ");
    rsync_save_jobs();
    EXPECT_EQ(rsync_job_list_empty(), 1);
    EXPECT_EQ(store_get("/backup_mgr/rsync/count"), "3");
    EXPECT_EQ(job_key(1, "user_description"), " <&\"'> \n x ");
    EXPECT_EQ(job_key(1, "rstate"), "7");
    EXPECT_EQ(job_key(1, "rsync_pwd"), "cHc=");
    EXPECT_EQ(job_key(2, "ssh_pwd"), "c3No");
    EXPECT_EQ(job_key(3, "in_remote_cloud_fqdn"), "cloud");
    EXPECT_EQ(job_key(3, "rlast_do_job_time"), "then");
    EXPECT_EQ(job_key(4, "job_name"), "(none)");

    const std::string first = read_file(STORE);
    rsync_load_jobs();
    rsync_save_jobs();
    EXPECT_EQ(read_file(STORE), first) << "a second save changes nothing";

    rsync_load_jobs();
    rsync_list_remove_job(rsync_find_job("two"));
    rsync_save_jobs();
    EXPECT_EQ(store_get("/backup_mgr/rsync/count"), "2");
    EXPECT_EQ(job_key(2, "job_name"), "three");
    rsync_load_jobs();
    while (rsync_list_remove_job(job_list->head) == 1) {
    }
    rsync_save_jobs();
    EXPECT_EQ(store_get("/backup_mgr/rsync/count"), "(none)");
}

TEST_F(JobList, LoadingBringsNumbersIntoRange)
{
    struct Case {
        const char *key;
        std::string stored;
        int loaded;
    };
    for (const Case &one : std::vector<Case>{{"retry", "16", 0},
                                             {"retry", "15", 15},
                                             {"retry", "-1", 0},
                                             {"retry_interval", "0", 30},
                                             {"retry_interval", "1", 1},
                                             {"retry_interval", "180", 180},
                                             {"retry_interval", "181", 30},
                                             {"rsync_timeout", "-5", 600},
                                             {"rsync_timeout", "0", 0}}) {
        SetUp();
        add_job({{one.key, one.stored}});
        rsync_load_jobs();
        for (const JobField &field : job_fields()) {
            if (std::string(field.key) != one.key) continue;
            EXPECT_EQ(integer_field(*job_list->head, field), one.loaded) << one.key << one.stored;
        }
    }
}

TEST_F(JobList, ALongTextIsKnownToBeCutAndACountIsNotTrusted)
{
    add_job({{"local_path", std::string(2600, 'x')}});
    store_set("/backup_mgr/rsync/count", "2");
    rsync_load_jobs();
    EXPECT_EQ(std::string(job_list->head->local_path), std::string(2599, 'x'));
    EXPECT_TRUE(was_cut(*job_list->head, "local_path"));
    EXPECT_FALSE(refusal_of_cut_text(*job_list->head)) << "its other folders can be transferred";
    EXPECT_STREQ(job_list->tail->job_name, "") << "counted, but not there";
    EXPECT_EQ(job_list->tail->retry_interval, 30);
    store_set("/backup_mgr/rsync/count", "2147483647");
    store_save();
    rsync_load_jobs();
    EXPECT_EQ(job_list->count, 2) << "a count beyond all reason ends with what is there";

    SetUp();
    add_job({{"local_path", std::string(2599, 'x')}, {"port", std::string(16, '8')}});
    for (int save = 0; save < 2; ++save) {
        rsync_load_jobs();
        EXPECT_FALSE(was_cut(*job_list->head, "local_path"));
        EXPECT_TRUE(refusal_of_cut_text(*job_list->head)) << "the port";
        rsync_save_jobs();
        EXPECT_EQ(job_key(1, "port"), std::string(16, '8')) << "a save must not make it a usable one";
    }
}

TEST_F(JobList, OnlyThePasswordFileIsWrittenBackToTheCaller)
{
    RsyncJob job = make_job("daily");
    job.rsync_user[0] = job.rsync_pwd[0] = job.port[0] = job.rsync_pwd_file[0] = '\0';
    job.inc_enable = 2;
    job.inc_number = 99;
    rsync_prepare_current_job(job);
    EXPECT_STREQ(CurrentJob.rsync_user, "root");
    EXPECT_STREQ(CurrentJob.rsync_pwd, "pakto");
    EXPECT_EQ(CurrentJob.pwd_encoded, 0);
    EXPECT_STREQ(CurrentJob.port, "873");
    EXPECT_EQ(CurrentJob.inc_number, 10);
    EXPECT_STREQ(job.rsync_pwd_file, "/tmp/r_daily.passwd");
    EXPECT_STREQ(job.rsync_user, "");
    EXPECT_STREQ(job.port, "");
    EXPECT_EQ(job.inc_number, 99);
}
