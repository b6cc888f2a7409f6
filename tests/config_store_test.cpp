// The stand-ins for the appliance's libraries: what is stored, what survives, and what others see of it.

#include "platform/config_store.h"
#include "platform/device.h"
#include "platform/scheduler.h"
#include "support.h"

#include <filesystem>
#include <sys/mount.h>
#include <unistd.h>

using namespace bakjob;

namespace
{

namespace fs = std::filesystem;

std::string text_at(const std::string &path)
{
    std::vector<char> buffer(10000, '\0');
    if (xml_get_str(path.c_str(), static_cast<int>(buffer.size()), buffer.data()) < 0) return "(none)";
    return buffer.data();
}

int set(const std::string &path, const std::string &text)
{
    return xml_set_str(path.c_str(), text.c_str());
}

int save()
{
    return xml_write_file(STORE.c_str());
}

// What another process does to the store meanwhile.
void elsewhere(const Keys &changes)
{
    ASSERT_EQ(in_child([&] {
                  for (const auto &[path, text] : changes)
                      set(path, text);
                  return save();
              }),
              0);
}

std::vector<std::string> files_beside_store()
{
    std::vector<std::string> names;
    for (const auto &entry : fs::directory_iterator("/etc/NAS_CFG"))
        names.push_back(entry.path().filename());
    return names;
}

class ConfigStore : public Appliance
{
protected:
    void SetUp() override
    {
        save(); // leaves nothing unsaved of the test before
        Appliance::SetUp();
    }
};

TEST_F(ConfigStore, ListsAreNumberedFromOneAndCloseUp)
{
    EXPECT_EQ(set("/list/item:3/name", "c"), 0);
    EXPECT_EQ(text_at("/list/item:1"), "");
    EXPECT_EQ(text_at("/list/item:1/name"), "(none)");
    EXPECT_EQ(text_at("/list/item:4"), "(none)");
    EXPECT_EQ(set("/list/item:1/name", "a"), 0);
    EXPECT_EQ(set("/list/item:2/name", "b"), 0);
    EXPECT_EQ(xml_set_int("/list/count", 3), 0);
    EXPECT_EQ(text_at("/list/item/name"), "a");

    EXPECT_EQ(text_at("/list/item:2/name"), "b");
    EXPECT_EQ(xml_del("/list/item:2"), 0);
    EXPECT_EQ(text_at("/list/item:2/name"), "c");
    EXPECT_EQ(text_at("/list/item:3/name"), "(none)");
    EXPECT_EQ(set("/list/item:3/name", "d"), 0);
    EXPECT_EQ(text_at("/list/item:1/name") + text_at("/list/item:2/name") + text_at("/list/item:3/name"),
              "acd");
    EXPECT_LT(xml_del("/list/item:4"), 0);
    EXPECT_EQ(xml_get_int("/list/count"), 3);
}

// Each look-up leaves a place to go on from, which another list, or a list within a list, must not disturb.
TEST_F(ConfigStore, ListsCanBeReadInAnyOrder)
{
    const auto item = [](int i) { return "/list/item:" + std::to_string(i); };
    const auto inner = [&](int i, int j) { return item(i) + "/inner:" + std::to_string(j) + "/v"; };
    for (int i = 1; i <= 12; ++i) {
        for (int j = 1; j <= 4; ++j)
            ASSERT_EQ(set(inner(i, j), inner(i, j)), 0);
        ASSERT_EQ(set(item(i) + "/last", std::to_string(i)), 0);
    }
    for (int step = 0; step < 300; ++step) {
        const int i = 1 + (step * 7 + step / 12) % 12;
        const int j = 1 + (step * 3) % 4;
        EXPECT_EQ(text_at(inner(i, j)), inner(i, j));
        EXPECT_EQ(text_at(item(i) + "/last"), std::to_string(i));
    }
}

TEST_F(ConfigStore, PathsAndValuesOutsideTheRulesAreRefused)
{
    EXPECT_EQ(set("/a/b", "1"), 0);
    for (const char *path : {"", "/", "a/b", "/a//b", "/a/b/", "/a/b:0", "/a/b:-1", "/a/b:", "/a/b:x",
                             "/a/b c", "/a/b:99999999999", "/<a>"}) {
        EXPECT_LT(xml_set_str(path, "x"), 0) << path;
        EXPECT_EQ(text_at(path), "(none)") << path;
    }
    char buffer[4] = "zzz";
    EXPECT_LT(xml_get_str("/a/c", sizeof buffer, buffer), 0);
    EXPECT_STREQ(buffer, "zzz");
    EXPECT_EQ(set("/a/c", "long text"), 0);
    EXPECT_EQ(xml_get_str("/a/c", 0, buffer), 0);
    EXPECT_STREQ(buffer, "zzz");
    EXPECT_EQ(xml_get_str("/a/c", sizeof buffer, buffer), 0);
    EXPECT_STREQ(buffer, "lon");

    const std::vector<std::pair<const char *, int>> numbers = {
        {"", -1}, {"x", -1}, {"7 days", 7}, {"-5", -5}, {"99999999999", 2147483647}};
    for (const auto &[text, number] : numbers) {
        EXPECT_EQ(set("/n", text), 0);
        EXPECT_EQ(xml_get_int("/n"), number) << text;
    }
}

TEST_F(ConfigStore, EveryByteSurvivesTheFile)
{
    std::string controls;
    for (char c = 1; c < 32; ++c)
        controls += c;
    const std::vector<std::string> texts = {
        "",    " ",     "  two  ",     "\t",       "\n",      "\r\n",     "\na\r\nb", "<&>\"'",
        "]]>", "&amp;", "<!-- no -->", "\xff\xfe", "caf\xe9", "\xc3\xa9", controls,   "a" + controls};
    for (std::size_t i = 0; i < texts.size(); ++i)
        ASSERT_EQ(set("/t/item:" + std::to_string(i + 1), texts[i]), 0);
    for (int round = 0; round < 2; ++round) {
        ASSERT_EQ(save(), 0);
        fs::last_write_time(STORE, fs::file_time_type::clock::now()); // so it is read again
        ASSERT_LT(xml_get_int("/none"), 0);
        for (std::size_t i = 0; i < texts.size(); ++i)
            EXPECT_EQ(text_at("/t/item:" + std::to_string(i + 1)), texts[i]) << "text " << i;
    }
    write_file(STORE,
               "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n<!-- mine -->\n<config>\n <!-- why -->\n"
               " <a><![CDATA[x<y]]></a>\n <a2>t<!-- or --><![CDATA[w]]>o</a2>\n <b>\n </b>\n</config>\n");
    EXPECT_EQ(text_at("/a") + text_at("/a2"), "x<ytwo");
    EXPECT_EQ(set("/b/c", "1"), 0);
    ASSERT_EQ(save(), 0);
    EXPECT_TRUE(has(read_file(STORE), "<!-- mine -->"));
    EXPECT_TRUE(has(read_file(STORE), "<!-- why -->"));
}

TEST_F(ConfigStore, WritesOfOtherProcessesAreSeenBetweenWalks)
{
    elsewhere({{"/list/item:1/name", "old"}, {"/list/count", "1"}});
    EXPECT_EQ(xml_get_int("/list/count"), 1);
    elsewhere({{"/list/item:1/name", "new"}});
    EXPECT_EQ(text_at("/list/item:1/name"), "old") << "still the same walk";
    EXPECT_EQ(xml_get_int("/list/count"), 1);
    EXPECT_EQ(text_at("/list/item:1/name"), "new");

    // What was read from one file is not changed in another where it is different: its items may have other
    // numbers now.
    elsewhere({{"/other", "theirs"}, {"/list/item:2/name", "theirs"}});
    const std::string theirs = read_file(STORE);
    EXPECT_TRUE(has(complaints_of([] {
                        EXPECT_LT(set("/list/item:1/name", "mine"), 0);
                        EXPECT_LT(xml_del("/list"), 0);
                        EXPECT_LT(save(), 0);
                    }),
                    "a change could not be made"));
    EXPECT_EQ(read_file(STORE), theirs);

    // A change of one's own begins with what is there now, and then stays until it is saved.
    EXPECT_EQ(xml_get_int("/list/count"), 1);
    ASSERT_EQ(set("/list/item:1/name", "mine"), 0);
    EXPECT_EQ(xml_get_int("/list/count"), 1);
    EXPECT_EQ(text_at("/list/item:1/name"), "mine");
    ASSERT_EQ(save(), 0);
    EXPECT_EQ(text_at("/other"), "theirs");

    // Elsewhere others may change what they like, also between a read and the change.
    EXPECT_EQ(xml_get_int("/list/count"), 1);
    elsewhere({{"/other", "theirs again"}});
    EXPECT_EQ(set("/list/item:1/name", "mine again"), 0);
    EXPECT_EQ(save(), 0);
    EXPECT_EQ(text_at("/other") + text_at("/list/item:1/name"), "theirs againmine again");

    // Nor is a file written over that came after the reading.
    ASSERT_EQ(set("/list/item:1/name", "again"), 0);
    write_file(STORE, "<config><other>newer</other></config>");
    EXPECT_TRUE(has(complaints_of([] { EXPECT_LT(save(), 0); }), "somebody else"));
    EXPECT_EQ(text_at("/other"), "newer");

    fs::remove(STORE);
    EXPECT_EQ(text_at("/other"), "(none)");
}

TEST_F(ConfigStore, ADamagedFileIsLeftAsItIs)
{
    for (const std::string damage : {"", "<config><a>1</a>", "<other><a>1</a></other>", "no xml"}) {
        write_file(STORE, damage);
        const auto said = lines_of(complaints_of([] {
            EXPECT_EQ(text_at("/a"), "(none)");
            EXPECT_EQ(xml_get_int("/list/item:1/a"), -1);
            EXPECT_LT(set("/a", "2"), 0);
            EXPECT_LT(xml_del("/a"), 0);
            EXPECT_LT(save(), 0);
            EXPECT_LT(LIB_do_ctc(), 0);
        }));
        EXPECT_EQ(said.size(), 2U) << "the reason, and that nothing is written: " << said[0];
        EXPECT_EQ(read_file(STORE), damage);
    }
    write_file(STORE, "<config><a>3</a></config>");
    EXPECT_EQ(text_at("/a"), "3");
}

// A folder of its own for the store, with little room.
class FullDisk : public ConfigStore
{
protected:
    void SetUp() override
    {
        ConfigStore::SetUp();
        ASSERT_EQ(mount("tmpfs", "/etc/NAS_CFG", "tmpfs", 0, "size=64k"), 0);
    }
    void TearDown() override
    {
        umount2("/etc/NAS_CFG", MNT_DETACH);
        ConfigStore::TearDown();
    }
};

TEST_F(FullDisk, AFailedWriteKeepsTheOldFileAndDropsTheChanges)
{
    ASSERT_EQ(set("/a", "1"), 0);
    ASSERT_EQ(save(), 0);
    const std::string before = read_file(STORE);
    ASSERT_EQ(set("/a", std::string(100'000, 'x')), 0);
    EXPECT_TRUE(has(complaints_of([] { EXPECT_LT(save(), 0); }), "No space left"));
    EXPECT_EQ(read_file(STORE), before);
    EXPECT_EQ(files_beside_store(), std::vector<std::string>{"config.xml"});
    EXPECT_EQ(text_at("/a"), "1");
    ASSERT_EQ(set("/b", "2"), 0);
    EXPECT_EQ(save(), 0);
    EXPECT_EQ(text_at("/a"), "1");

    const ReadOnly mounted("/etc/NAS_CFG");
    ASSERT_EQ(set("/b", "3"), 0);
    EXPECT_LT(save(), 0);
    EXPECT_EQ(text_at("/b"), "2");
}

TEST_F(ConfigStore, TheNextWriteRemovesWhatACrashLeft)
{
    const pid_t dead = fork();
    if (dead == 0) _exit(0);
    wait_for(dead);
    const std::string leftover = STORE + ".new.";
    write_file(leftover + std::to_string(dead), "half");
    write_file(leftover + std::to_string(getpid()), "half, of a process that had this one's number");
    write_file(leftover + "1", "of one that lives");
    ASSERT_EQ(set("/a", "1"), 0);
    ASSERT_EQ(save(), 0);
    fs::remove(leftover + "1");
    EXPECT_EQ(files_beside_store(), std::vector<std::string>{"config.xml"});

    EXPECT_EQ(octal_mode(STORE), "600");
    ASSERT_EQ(LIB_CP_Config_To_MTD(1), 0);
    EXPECT_EQ(read_file(FLASH), read_file(STORE));
    fs::remove(STORE);
    EXPECT_LT(LIB_CP_Config_To_MTD(1), 0);
    EXPECT_TRUE(exists(FLASH));
}

TEST_F(ConfigStore, CronGetsTheEntriesThatItCanHold)
{
    const auto add = [](const char *minute, const char *user, const char *run, const char *group) {
        return LIB_create_xml(minute, "3", "*", "*", "1-5", user, run, group);
    };
    ASSERT_EQ(add("0", "root", "backup 'my job' +%d \\%", "backup"), 0);
    ASSERT_EQ(add("5", "root", "two\nlines", "backup"), 0);
    ASSERT_EQ(add("1 2", "root", "blank in a time", "backup"), 0);
    ASSERT_EQ(add("7", "", "no user", "backup"), 0);
    ASSERT_EQ(add("*/9", "bk", "other", "mail"), 0);
    EXPECT_LT(add("0", "root", "x", "list"), 0);
    EXPECT_TRUE(has(complaints_of([] { EXPECT_EQ(LIB_do_ctc(), 0); }), "left out"));
    EXPECT_EQ(read_file(CRON), "0 3 * * 1-5 root backup 'my job' +\\%d \\\\%\n*/9 3 * * 1-5 bk other\n");

    EXPECT_EQ(LIB_do_delete_xml("backup"), 0);
    EXPECT_LT(LIB_do_delete_xml("backup"), 0);
    ASSERT_EQ(LIB_do_ctc(), 0);
    EXPECT_EQ(read_file(CRON), "*/9 3 * * 1-5 bk other\n");
    EXPECT_EQ(xml_get_int("/system_mgr/crond/list/count"), 1);
}

} // namespace
