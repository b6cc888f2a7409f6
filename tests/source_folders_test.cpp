#include "cli/source_folders.h"
#include "common/run_options.h"
#include "common/text.h"
#include "config/current_job.h"
#include "support.h"

#include <cstring>
#include <filesystem>
#include <sys/stat.h>

using namespace bakjob;
namespace fs = std::filesystem;

class Folders : public Appliance
{
protected:
    void SetUp() override
    {
        Appliance::SetUp();
        add_share("Public", SHARE);
        add_share("Inner", "/mnt/HD/HD_a2/Public/inner");
        add_share("Public2", "/mnt/HD/HD_a2/Public2");
        add_share("Gone", "/mnt/HD/HD_a2/Gone");
        fs::remove_all("/mnt/HD/HD_a2/Gone");
        shell("cd " + SHARE + " && mkdir -p x/y && touch x/f.txt g.txt && ln -s /tmp x/link");
    }
};

TEST_F(Folders, LieInTheFirstShareThatHoldsThem)
{
    struct Case {
        std::string folder;
        int result;
        std::string remote;
        std::string subdir;
    };
    const std::string &base = SHARE;
    const std::vector<Case> cases = {
        {base, 0, "/base/Public", "/"},
        {base + "/x/y", 0, "/base/Public", "/x/y"},
        {base + "/x/f.txt", 0, "/base/Public", "/x"},
        {base + "/g.txt", 0, "/base/Public", "/"},
        {base + "/x/link", 0, "/base/Public", "/x"},
        {base + "/missing/z", 0, "/base/Public", "/missing"},
        {base + "/inner", 0, "/base/Public", "/inner"},
        {base + "2", 0, "/base/Public2", "/"},
        {base + "23", -1, "", ""},
        {"/mnt/HD/HD_a2", -1, "", ""},
        {base + "/../../../etc", -1, "", ""},
        {base + "/x/..", -1, "", ""},
        {"/mnt/HD/HD_a2/Gone/x", -1, "/base/Gone", "/"},
    };
    for (const Case &one : cases) {
        fs::current_path("/");
        EXPECT_EQ(rsync_resolve_folder("/base", one.folder), one.result) << one.folder;
        EXPECT_EQ(share_remote_dir, one.remote) << one.folder;
        EXPECT_EQ(share_subdir, one.subdir) << one.folder;
        EXPECT_EQ(fs::current_path() == share_path, one.result == 0);
    }
    EXPECT_EQ(rsync_resolve_folder(std::string(1020, 'r'), base), -1) << "a cut remote folder is another one";
    Appliance::SetUp();
    EXPECT_EQ(rsync_resolve_folder("/base", base), -1) << "no shares at all";
}

TEST_F(Folders, AListIsSplitAndWhatDoesNotFitIsCounted)
{
    const auto split = [](const std::string &list, bool cut = false) {
        RsyncJob job{};
        if (cut) job.whole_texts = std::make_shared<WholeTexts>(WholeTexts{{"local_path", list + "more"}});
        snprintf(job.local_path, sizeof job.local_path, "%s", list.c_str());
        FolderTable table{};
        rsync_split_folders(job, table);
        std::string all;
        for (int i = 0; i < table.count; ++i)
            all += table.entries[i] + std::string("|");
        return std::to_string(table.left_out) + " " + all;
    };
    EXPECT_EQ(split("::/a::/b b:"), "0 /a|/b b|");
    EXPECT_EQ(split(""), "0 ");
    EXPECT_EQ(split(":::"), "0 ");
    EXPECT_EQ(split("1:2:3:4:5:6:7:8:9:10:11:12"), "2 1|2|3|4|5|6|7|8|9|10|");
    EXPECT_EQ(split("/" + std::string(258, 'x') + ":/b"), "0 /" + std::string(258, 'x') + "|/b|");
    EXPECT_EQ(split("/" + std::string(259, 'x') + ":/b"), "1 /b|");
    // A list that was cut has lost the end of its last folder.
    const std::string full = "/a:" + std::string(2596 - 200, ':') + std::string(200, 'x');
    ASSERT_EQ(full.size(), 2599U);
    EXPECT_EQ(split(full, true), "1 /a|");
    EXPECT_EQ(split(full), "0 /a|" + std::string(200, 'x') + "|");
}

TEST_F(Folders, ProgressAndSerialAreReadAndWrittenSafely)
{
    const std::string path = "/tmp/rsync_bakcup_src_folder_name.it's";
    write_file("/tmp/victim", "kept");
    fs::create_symlink("/tmp/victim", path);
    rsync_write_progress(named("it's"), "/mnt/a", 3, 3);
    EXPECT_EQ(read_file(path), "/mnt/a\n3/3\n");
    EXPECT_EQ(read_file("/tmp/victim"), "kept");
    rsync_write_progress(named("it's"), "", 1, 1);
    EXPECT_EQ(read_file(path), "/mnt/a\n3/3\n");
    rsync_remove_progress(named("it's"));
    EXPECT_FALSE(exists(path));

    char serial[SERIAL_SIZE] = "as it was";
    EXPECT_EQ(rsync_read_serial(serial), -1);
    EXPECT_STREQ(serial, "as it was");
    for (const auto &[text, read] : Keys{
             {"S123", "S123"}, {"S1\nx", "S1\n"}, {"", ""}, {std::string(200, 's'), std::string(127, 's')}}) {
        write_file("/tmp/kv_serial.txt", text);
        EXPECT_EQ(rsync_read_serial(serial), 0);
        EXPECT_EQ(serial, read);
    }
    for (const char *made : {"mkfifo $f", "mkdir $f", "echo S2 >/tmp/other; ln -s /tmp/other $f",
                             "printf S2 >$f; ln $f /tmp/more", "printf S2 >$f; chown 1000 $f",
                             "printf S2 >$f; chmod 664 $f", "printf S2 >$f; chmod 646 $f",
                             "printf ../../etc >$f", "printf '/\\n' >$f", "printf . >$f", "printf .. >$f"}) {
        shell(std::string("f=/tmp/kv_serial.txt; rm -rf $f /tmp/other /tmp/more; ") + made);
        copy_text(serial, "as it was");
        EXPECT_EQ(rsync_read_serial(serial), -1) << made;
        EXPECT_STREQ(serial, "as it was") << made;
        EXPECT_NE(rsync_serial_refusal(), "") << made;
        run_options.debug_mode = 1;
        const auto ask = [] { EXPECT_FALSE(rsync_remote_root(named("j"))); };
        EXPECT_TRUE(printed_by(ask).starts_with("ERROR: serial text of [")) << made;
        run_options.debug_mode = 0;
    }
}
