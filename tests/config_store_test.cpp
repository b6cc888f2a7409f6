// The stand-ins for the appliance's libraries: what is stored, what survives, and what others see of it.

#include "platform/config_store.h"
#include "platform/device.h"
#include "platform/scheduler.h"
#include "support.h"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <string>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>
#include <vector>

using namespace bakjob;

namespace
{

namespace fs = std::filesystem;

constexpr const char *STORE = "/etc/NAS_CFG/config.xml";

std::string text_at(const std::string &path)
{
    std::vector<char> buffer(10000, '\0');
    if (xml_get_str(path.c_str(), static_cast<int>(buffer.size()), buffer.data()) < 0) return "(none)";
    return buffer.data();
}

std::vector<std::string> files_beside_store()
{
    std::vector<std::string> names;
    for (const auto &entry : fs::directory_iterator("/etc/NAS_CFG")) {
        names.push_back(entry.path().filename());
    }
    return names;
}

class ConfigStore : public Appliance
{
protected:
    void SetUp() override
    {
        xml_write_file(STORE); // leaves nothing unsaved of the test before
        Appliance::SetUp();
    }
};

TEST_F(ConfigStore, ListsAreNumberedFromOneAndCloseUp)
{
    EXPECT_EQ(xml_set_str("/list/item:3/name", "c"), 0);
    EXPECT_EQ(text_at("/list/item:1"), "");
    EXPECT_EQ(text_at("/list/item:1/name"), "(none)");
    EXPECT_EQ(text_at("/list/item:4"), "(none)");
    EXPECT_EQ(xml_set_str("/list/item:1/name", "a"), 0);
    EXPECT_EQ(xml_set_str("/list/item:2/name", "b"), 0);
    EXPECT_EQ(xml_set_int("/list/count", 3), 0);
    EXPECT_EQ(text_at("/list/item/name"), "a");

    EXPECT_EQ(text_at("/list/item:2/name"), "b");
    EXPECT_EQ(xml_del("/list/item:2"), 0);
    EXPECT_EQ(text_at("/list/item:2/name"), "c");
    EXPECT_EQ(text_at("/list/item:3/name"), "(none)");
    EXPECT_EQ(xml_set_str("/list/item:3/name", "d"), 0);
    EXPECT_EQ(text_at("/list/item:1/name") + text_at("/list/item:2/name") + text_at("/list/item:3/name"),
              "acd");
    EXPECT_LT(xml_del("/list/item:4"), 0);
    EXPECT_EQ(xml_get_int("/list/count"), 3);
}

// Each look-up leaves a place to go on from, which another list, or a list within a list, must not disturb.
TEST_F(ConfigStore, ListsCanBeReadInAnyOrder)
{
    const auto value = [](int i, int j) { return std::to_string(i) + "-" + std::to_string(j); };
    const auto path = [](int i, int j) {
        return "/list/item:" + std::to_string(i) + "/inner:" + std::to_string(j) + "/v";
    };
    for (int i = 1; i <= 12; ++i) {
        for (int j = 1; j <= 4; ++j) {
            ASSERT_EQ(xml_set_str(path(i, j).c_str(), value(i, j).c_str()), 0);
        }
        ASSERT_EQ(xml_set_int(("/list/item:" + std::to_string(i) + "/last").c_str(), i), 0);
    }
    for (int step = 0; step < 300; ++step) {
        const int i = 1 + (step * 7 + step / 12) % 12;
        const int j = 1 + (step * 3) % 4;
        EXPECT_EQ(text_at(path(i, j)), value(i, j));
        EXPECT_EQ(xml_get_int(("/list/item:" + std::to_string(i) + "/last").c_str()), i);
    }
}

TEST_F(ConfigStore, PathsAndValuesOutsideTheRulesAreRefused)
{
    EXPECT_EQ(xml_set_str("/a/b", "1"), 0);
    for (const char *path : {"", "/", "a/b", "/a//b", "/a/b/", "/a/b:0", "/a/b:-1", "/a/b:", "/a/b:x",
                             "/a/b c", "/a/b:99999999999", "/<a>"}) {
        EXPECT_LT(xml_set_str(path, "x"), 0) << path;
        EXPECT_EQ(text_at(path), "(none)") << path;
    }
    char buffer[4] = "zzz";
    EXPECT_LT(xml_get_str("/a/c", sizeof buffer, buffer), 0);
    EXPECT_STREQ(buffer, "zzz");
    EXPECT_EQ(xml_set_str("/a/c", "long text"), 0);
    EXPECT_EQ(xml_get_str("/a/c", 0, buffer), 0);
    EXPECT_STREQ(buffer, "zzz");
    EXPECT_EQ(xml_get_str("/a/c", sizeof buffer, buffer), 0);
    EXPECT_STREQ(buffer, "lon");

    const std::vector<std::pair<const char *, int>> numbers = {
        {"", -1}, {"x", -1}, {"7 days", 7}, {"-5", -5}, {"99999999999", 2147483647}};
    for (const auto &[text, number] : numbers) {
        EXPECT_EQ(xml_set_str("/n", text), 0);
        EXPECT_EQ(xml_get_int("/n"), number) << text;
    }
}

TEST_F(ConfigStore, EveryByteSurvivesTheFile)
{
    std::string controls;
    for (char c = 1; c < 32; ++c) {
        controls += c;
    }
    const std::vector<std::string> texts = {
        "",    " ",     "  two  ",     "\t",       "\n",      "\r\n",     "\na\r\nb", "<&>\"'",
        "]]>", "&amp;", "<!-- no -->", "\xff\xfe", "caf\xe9", "\xc3\xa9", controls,   "a" + controls};
    for (std::size_t i = 0; i < texts.size(); ++i) {
        ASSERT_EQ(xml_set_str(("/t/item:" + std::to_string(i + 1)).c_str(), texts[i].c_str()), 0);
    }
    for (int round = 0; round < 2; ++round) {
        ASSERT_EQ(xml_write_file(STORE), 0);
        fs::last_write_time(STORE, fs::file_time_type::clock::now()); // so it is read again
        ASSERT_LT(xml_get_int("/none"), 0);
        for (std::size_t i = 0; i < texts.size(); ++i) {
            EXPECT_EQ(text_at("/t/item:" + std::to_string(i + 1)), texts[i]) << "text " << i;
        }
    }
    write_file(STORE, "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n<!-- mine -->\n<config>\n <!-- why -->\n"
                      " <a><![CDATA[x<y]]></a>\n <b>\n </b>\n</config>\n");
    EXPECT_EQ(text_at("/a"), "x<y");
    EXPECT_EQ(xml_set_str("/b/c", "1"), 0);
    ASSERT_EQ(xml_write_file(STORE), 0);
    EXPECT_NE(read_file(STORE).find("<!-- mine -->"), std::string::npos);
    EXPECT_NE(read_file(STORE).find("<!-- why -->"), std::string::npos);
}

TEST_F(ConfigStore, WritesOfOtherProcessesAreSeenBetweenWalks)
{
    ASSERT_EQ(xml_set_str("/list/item:1/name", "old"), 0);
    ASSERT_EQ(xml_set_int("/list/count", 1), 0);
    ASSERT_EQ(xml_write_file(STORE), 0);
    ASSERT_EQ(in_child([] {
                  xml_set_str("/list/item:1/name", "new");
                  return xml_write_file(STORE);
              }),
              0);
    EXPECT_EQ(text_at("/list/item:1/name"), "old"); // still the same walk
    EXPECT_EQ(xml_get_int("/list/count"), 1);
    EXPECT_EQ(text_at("/list/item:1/name"), "new");

    // What was read from one file is not changed in another where it is different: its items may have other
    // numbers now.
    ASSERT_EQ(in_child([] {
                  xml_set_str("/other", "theirs");
                  xml_set_str("/list/item:2/name", "theirs");
                  return xml_write_file(STORE);
              }),
              0);
    const std::string theirs = read_file(STORE);
    testing::internal::CaptureStderr();
    EXPECT_LT(xml_set_str("/list/item:1/name", "mine"), 0);
    EXPECT_LT(xml_del("/list"), 0);
    EXPECT_LT(xml_write_file(STORE), 0);
    EXPECT_NE(testing::internal::GetCapturedStderr().find("a change could not be made"), std::string::npos);
    EXPECT_EQ(read_file(STORE), theirs);

    // A change of one's own begins with what is there now, and then stays until it is saved.
    EXPECT_EQ(xml_get_int("/list/count"), 1);
    ASSERT_EQ(xml_set_str("/list/item:1/name", "mine"), 0);
    EXPECT_EQ(xml_get_int("/list/count"), 1);
    EXPECT_EQ(text_at("/list/item:1/name"), "mine");
    ASSERT_EQ(xml_write_file(STORE), 0);
    EXPECT_EQ(text_at("/other"), "theirs");

    // Elsewhere others may change what they like, also between a read and the change.
    EXPECT_EQ(xml_get_int("/list/count"), 1);
    ASSERT_EQ(in_child([] {
                  xml_set_str("/other", "theirs again");
                  return xml_write_file(STORE);
              }),
              0);
    EXPECT_EQ(xml_set_str("/list/item:1/name", "mine again"), 0);
    EXPECT_EQ(xml_write_file(STORE), 0);
    EXPECT_EQ(text_at("/other") + text_at("/list/item:1/name"), "theirs againmine again");

    // Nor is a file written over that came after the reading.
    ASSERT_EQ(xml_set_str("/list/item:1/name", "again"), 0);
    write_file(STORE, "<config><other>newer</other></config>");
    testing::internal::CaptureStderr();
    EXPECT_LT(xml_write_file(STORE), 0);
    EXPECT_NE(testing::internal::GetCapturedStderr().find("somebody else"), std::string::npos);
    EXPECT_EQ(text_at("/other"), "newer");

    fs::remove(STORE);
    EXPECT_EQ(text_at("/other"), "(none)");
}

TEST_F(ConfigStore, ADamagedFileIsLeftAsItIs)
{
    for (const std::string damage : {"", "<config><a>1</a>", "<other><a>1</a></other>", "no xml"}) {
        write_file(STORE, damage);
        testing::internal::CaptureStderr();
        EXPECT_EQ(text_at("/a"), "(none)");
        EXPECT_EQ(xml_get_int("/list/item:1/a"), -1);
        EXPECT_LT(xml_set_str("/a", "2"), 0);
        EXPECT_LT(xml_del("/a"), 0);
        EXPECT_LT(xml_write_file(STORE), 0);
        EXPECT_LT(LIB_do_ctc(), 0);
        const std::string said = testing::internal::GetCapturedStderr();
        EXPECT_EQ(std::count(said.begin(), said.end(), '\n'), 2)
            << said; // the reason, and that nothing is written
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
        while (umount2("/etc/NAS_CFG", MNT_DETACH) == 0) {
        }
        ConfigStore::TearDown();
    }
};

TEST_F(FullDisk, AFailedWriteKeepsTheOldFileAndDropsTheChanges)
{
    ASSERT_EQ(xml_set_str("/a", "1"), 0);
    ASSERT_EQ(xml_write_file(STORE), 0);
    const std::string before = read_file(STORE);
    testing::internal::CaptureStderr();
    ASSERT_EQ(xml_set_str("/a", std::string(100'000, 'x').c_str()), 0);
    EXPECT_LT(xml_write_file(STORE), 0);
    EXPECT_NE(testing::internal::GetCapturedStderr().find("No space left"), std::string::npos);
    EXPECT_EQ(read_file(STORE), before);
    EXPECT_EQ(files_beside_store(), std::vector<std::string>{"config.xml"});
    EXPECT_EQ(text_at("/a"), "1");
    ASSERT_EQ(xml_set_str("/b", "2"), 0);
    EXPECT_EQ(xml_write_file(STORE), 0);
    EXPECT_EQ(text_at("/a"), "1");

    ASSERT_EQ(mount("/etc/NAS_CFG", "/etc/NAS_CFG", "", MS_BIND, nullptr), 0);
    ASSERT_EQ(mount(nullptr, "/etc/NAS_CFG", "", MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
    ASSERT_EQ(xml_set_str("/b", "3"), 0);
    EXPECT_LT(xml_write_file(STORE), 0);
    EXPECT_EQ(text_at("/b"), "2");
}

TEST_F(ConfigStore, TheNextWriteRemovesWhatACrashLeft)
{
    const pid_t dead = fork();
    if (dead == 0) _exit(0);
    waitpid(dead, nullptr, 0);
    const std::string leftover = std::string(STORE) + ".new.";
    write_file(leftover + std::to_string(dead), "half");
    write_file(leftover + std::to_string(getpid()), "half, of a process that had this one's number");
    write_file(leftover + "1", "of one that lives");
    ASSERT_EQ(xml_set_str("/a", "1"), 0);
    ASSERT_EQ(xml_write_file(STORE), 0);
    fs::remove(leftover + "1");
    EXPECT_EQ(files_beside_store(), std::vector<std::string>{"config.xml"});

    EXPECT_EQ(octal_mode(STORE), "600");
    ASSERT_EQ(LIB_CP_Config_To_MTD(1), 0);
    EXPECT_EQ(read_file("/var/lib/device_flash/config.xml"), read_file(STORE));
    fs::remove(STORE);
    EXPECT_LT(LIB_CP_Config_To_MTD(1), 0);
    EXPECT_TRUE(fs::exists("/var/lib/device_flash/config.xml"));
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
    testing::internal::CaptureStderr();
    ASSERT_EQ(LIB_do_ctc(), 0);
    EXPECT_NE(testing::internal::GetCapturedStderr().find("left out"), std::string::npos);
    EXPECT_EQ(read_file("/etc/cron.d/device_scheduler"),
              "0 3 * * 1-5 root backup 'my job' +\\%d \\\\%\n*/9 3 * * 1-5 bk other\n");

    EXPECT_EQ(LIB_do_delete_xml("backup"), 0);
    EXPECT_LT(LIB_do_delete_xml("backup"), 0);
    ASSERT_EQ(LIB_do_ctc(), 0);
    EXPECT_EQ(read_file("/etc/cron.d/device_scheduler"), "*/9 3 * * 1-5 bk other\n");
    EXPECT_EQ(xml_get_int("/system_mgr/crond/list/count"), 1);
}

TEST_F(ConfigStore, TheShareTableKeepsItsPromisedLayout)
{
    const auto pointer_at = [](const char *bytes, std::size_t offset) {
        char *pointer = nullptr;
        std::memcpy(&pointer, bytes + offset, sizeof pointer);
        return pointer;
    };
    ASSERT_EQ(get_samba_info(), 0);
    EXPECT_EQ(pointer_at(pss, SHARE_TABLE_FIRST), nullptr);

    xml_set_str("/system_mgr/samba/share/item:1/name", "Public");
    xml_set_str("/system_mgr/samba/share/item:1/path", "/mnt/HD/HD_a2/Public");
    xml_set_str("/system_mgr/samba/share/item:2/name", std::string(2000, 'n').c_str());
    xml_set_str("/system_mgr/samba/share/item:2/path", "/too long a name");
    xml_set_str("/system_mgr/samba/share/item:3/name", " my share");
    xml_set_str("/system_mgr/samba/share/item:3/path", "/mnt/HD/HD_a2/my share");
    xml_set_int("/system_mgr/samba/share/count", 3);
    ASSERT_EQ(get_samba_info(), 0);
    const char *first = pointer_at(pss, SHARE_TABLE_FIRST);
    ASSERT_NE(first, nullptr);
    EXPECT_STREQ(first + SHARE_NAME, "Public");
    EXPECT_STREQ(first + SHARE_PATH, "/mnt/HD/HD_a2/Public");
    const char *second = pointer_at(first, SHARE_NEXT);
    ASSERT_NE(second, nullptr);
    EXPECT_STREQ(second + SHARE_NAME, " my share");
    EXPECT_EQ(pointer_at(second, SHARE_NEXT), nullptr);
    Free_All_List();
    EXPECT_EQ(pss, nullptr);
}

TEST_F(ConfigStore, AlertsAreOneLineEachWhateverTheyHold)
{
    ASSERT_EQ(fireAlert(2, 1001, "job 'a\nb' failed"), 0);
    ASSERT_EQ(fireAlert(1, 7, ""), 0);
    EXPECT_EQ(read_file("/var/log/device_alerts"), "2 1001 job 'a?b' failed\n1 7 \n");
}

} // namespace
