// A configuration that is damaged, missing or cannot be read: nothing of it, nor of its copy in flash, is
// lost.

#include "common/text.h"
#include "config/job_list.h"
#include "config/job_operations.h"
#include "config/job_store.h"
#include "ctl_support.h"
#include "platform/config_store.h"

#include <filesystem>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

class WholeList : public Ctl
{
protected:
    void SetUp() override
    {
        Ctl::SetUp();
        for (const char *name : {"one", "two", "three"})
            ASSERT_TRUE(says(add(name), 0, ""));
        good_ = read_file(STORE);
    }

    // What would change a job leaves both files as they are, and says why.
    static void expect_refused(const std::string &reason)
    {
        const auto both = [] {
            return read_file(STORE) + (exists(STORE) ? "|" : "none|") + read_file(FLASH);
        };
        const std::string before = both();
        for (const std::string change : {"set one retry=1", "delete one", "disable two",
                                         "add four remote_ip=127.0.0.1 remote_path=backup "
                                         "local_path=/mnt/HD/HD_a2/Public"})
            EXPECT_TRUE(says(ctl(change), 3, reason)) << change;
        EXPECT_TRUE(says(ctl("list"), 3, reason));
        EXPECT_TRUE(says(ctl("check one"), 3, reason));
        bakjob_program("-r one");
        bakjob_program("-a");
        bakjob_program("-k two");
        EXPECT_EQ(rsync_enable_job("one"), 0);
        EXPECT_TRUE(both() == before);
    }

    // The store with pieces of its text in the place of others.
    void put_damaged(const Keys &replacements) const
    {
        std::string text = good_;
        for (const auto &[piece, other] : replacements) {
            const std::size_t at = text.find(piece);
            ASSERT_NE(at, std::string::npos) << piece;
            text.replace(at, piece.size(), other);
        }
        write_file(STORE, text);
    }

    std::string good_;
};

TEST_F(WholeList, ACountThatCannotBeRightStopsEverySave)
{
    for (const char *wrong : {"", "<count>-1</count>", "<count>0</count>", "<count>x</count>"}) {
        put_damaged({{"<count>3</count>", wrong}});
        SCOPED_TRACE(wrong);
        expect_refused("count is missing or below 1");
        EXPECT_TRUE(says(bakjob_program("-d -a"), 0, "ERROR: jobs are left out"));
    }
    put_damaged({{"<count>3</count>", "<count>2147483647</count>"}});
    expect_refused("count is much larger than the number of items");
    put_damaged({{"<rsync>", "<rsync><count>1</count><item><job_name>one</job_name></item></rsync><rsync>"}});
    expect_refused("there are two lists of jobs");
    const std::string start(127, 'x');
    put_damaged({{"<job_name>two<", "<job_name>" + start + "photos<"},
                 {"<job_name>three<", "<job_name>" + start + "music<"}});
    expect_refused("the names of two jobs begin with the same 127 bytes");

    write_file(STORE, good_);
    EXPECT_TRUE(says(ctl("set one retry=1"), 0, ""));
    EXPECT_NE(read_file(STORE), good_);
}

TEST_F(WholeList, ItemsWithoutKnownKeysDoNotHideThoseBehind)
{
    put_damaged({{"<count>3</count>", "<count>5</count><item><x>1</x></item><item><y>2</y></item>"}});
    EXPECT_TRUE(rsync_load_jobs());
    for (const char *name : {"one", "two", "three"})
        EXPECT_NE(rsync_find_job(name), nullptr) << name;
    EXPECT_NE(rsync_find_job(""), nullptr) << "the items are there";
    rsync_free_jobs();
    EXPECT_TRUE(says(ctl("delete two"), 0, ""));
    EXPECT_TRUE(says(ctl("list --names"), 0, "one\nthree\n"));
}

TEST_F(WholeList, AMissingFileIsNotAnEmptyOneWhileFlashHasItsCopy)
{
    fs::remove(STORE);
    const std::string remedy = "cp -p /var/lib/device_flash/config.xml /etc/NAS_CFG/config.xml";
    expect_refused(remedy);
    ASSERT_EQ(shell(remedy).status, 0);
    EXPECT_TRUE(says(ctl("list --names"), 0, "one\ntwo\nthree\n"));

    fs::remove(STORE);
    fs::create_symlink("/etc/NAS_CFG/gone", STORE);
    expect_refused("a link to a file that is not there");
    EXPECT_FALSE(exists("/etc/NAS_CFG/gone"));

    // A copy that cannot be read may be mended.
    fs::remove(STORE);
    write_file(FLASH, good_.substr(0, good_.size() - 20));
    expect_refused("move the copy away to begin anew");

    // Without one, an appliance begins with nothing.
    fs::remove(FLASH);
    EXPECT_TRUE(says(add("new"), 0, ""));
    EXPECT_TRUE(says(ctl("list --names"), 0, "new\n"));
}

TEST_F(WholeList, WhatBringsTheProgramDownIsRefused)
{
    std::string deep = "<config>";
    for (const char *step : {"<a>", "</a>"})
        for (int i = 0; i < 100'000; ++i)
            deep += step;
    write_file(STORE, deep + good_.substr(good_.find("<config>") + 8));
    expect_refused("its elements are nested too deep");
    write_file(STORE, "<!DOCTYPE config [<!ENTITY nas \"NAS\">]>" + good_.substr(good_.find("<config>")));
    expect_refused("it declares entities");
    write_file(STORE, good_ + std::string(1, '\0') + "<more/>");
    expect_refused("it holds a NUL byte");

    put_damaged({{"<user_description></user_description>",
                  "<user_description>" + std::string(1 << 20, 'x') + "</user_description>"}});
    expect_refused("longer than 1 MiB");
}

TEST_F(WholeList, AFileThatMayNotGrowIsAFailedWrite)
{
    const std::string flash = read_file(FLASH);
    EXPECT_TRUE(
        says(shell("(ulimit -f 1; exec /usr/sbin/bakjobctl set one retry=9) 2>&1"), 3, "File too large"));
    shell("(ulimit -f 1; exec /usr/sbin/bakjob -r one)");
    EXPECT_TRUE(read_file(STORE) == good_);
    EXPECT_TRUE(read_file(FLASH) == flash);
    EXPECT_TRUE(says(ctl("status one"), 0, "done, not recorded")) << "what the run came to";
}

TEST_F(WholeList, ALinkedFileAndItsOwnersRulesStay)
{
    fs::rename(STORE, "/etc/NAS_CFG/real.xml");
    fs::create_symlink("real.xml", STORE);
    ASSERT_EQ(shell("chown 7:8 /etc/NAS_CFG/real.xml && chmod 0400 /etc/NAS_CFG/real.xml").status, 0);
    EXPECT_TRUE(says(ctl("delete two"), 0, ""));
    EXPECT_TRUE(fs::is_symlink(STORE));
    EXPECT_EQ(shell("stat -c '%u:%g %a' /etc/NAS_CFG/real.xml").output, "7:8 400\n");
    EXPECT_EQ(read_file(FLASH), read_file("/etc/NAS_CFG/real.xml"));
    EXPECT_TRUE(says(ctl("list --names"), 0, "one\nthree\n"));
    fs::permissions("/etc/NAS_CFG/real.xml", fs::perms(0666));
    EXPECT_TRUE(says(ctl("delete three"), 0, ""));
    EXPECT_EQ(octal_mode("/etc/NAS_CFG/real.xml"), "600") << "it holds passwords";
}

// What a text says beyond its field is of no use to a job, but it is somebody's.
TEST_F(WholeList, LongTextsStayWholeThroughSavesAndRenames)
{
    const std::string paths = "/mnt/HD/HD_a2/Public:" + std::string(40'000, 'p') + ":/end";
    const std::string path = "/backup_mgr/rsync/item:2/local_path";
    store_set(path, paths);
    store_save();
    const auto stored = [&] {
        std::string text(50'000, '\0');
        store_get("/backup_mgr/rsync/count");
        xml_get_str(path.c_str(), 50'000, text.data());
        return std::string(text.c_str());
    };
    EXPECT_TRUE(says(ctl("set one retry=1"), 0, ""));
    EXPECT_EQ(stored(), paths);

    RsyncJob job{};
    ASSERT_EQ(rsync_get_job(job, "two"), 1);
    copy_text(job.job_name, "renamed");
    EXPECT_EQ(rsync_modify_job(job, "two"), 1);
    EXPECT_EQ(job_key(2, "job_name"), "renamed");
    EXPECT_EQ(stored(), paths);

    EXPECT_TRUE(says(ctl("set renamed local_path=/mnt/HD/HD_a2/Public"), 0, ""));
    EXPECT_EQ(stored(), "/mnt/HD/HD_a2/Public") << "a new text takes its place";
}

} // namespace
