// What reaches a terminal: nothing but what it shows.

#include "common/text.h"
#include "support.h"

using namespace bakjob;

TEST(Terminal, OnlyWhatItShowsIsPrintable)
{
    const std::vector<std::pair<std::string, std::string>> texts = {
        {"plain ~ text", "plain ~ text"},
        {"a\033[2Jb\a\x7f\tc", "a?[2Jb???c"},
        {"caf\xc3\xa9 \xe2\x82\xac \xf0\x9f\x98\x80", "caf\xc3\xa9 \xe2\x82\xac \xf0\x9f\x98\x80"},
        {"\xc2\x9b"
         "2J",
         "?2J"}, // a control character of the second set, in UTF-8
        {"\x9b"
         "2J \xff",
         "?2J ?"},                                       // and as one byte
        {"\xc0\xaf \xed\xa0\x80 \xe2\x82", "?? ??? ??"}, // too long a form, a half pair, a cut one
        {"a\xe2\x80\xae"
         "b",
         "a?b"}, // turns the direction of writing
    };
    for (const auto &[text, shown] : texts)
        EXPECT_EQ(printable(text), shown);
}

// The trace of a hostile name is for whoever reads a file as it is, and harmless for whoever sits at a
// terminal.
TEST(Terminal, ATraceDoesNotActOnIt)
{
    write_file("/tmp/trace", "#!/bin/bash\n/usr/sbin/bakjob -d -r $'x\\e[2J\\xc2\\x9b1my'\n");
    EXPECT_EQ(shell("bash /tmp/trace").output,
              "OPEN DEBUG MODE!!\nERROR: not found this job_name [x\033[2J\xc2\x9b"
              "1my] or disabled\n");
    EXPECT_EQ(shell("script -qec 'bash /tmp/trace' /dev/null </dev/null").output,
              "OPEN DEBUG MODE!!\r\nERROR: not found this job_name [x?[2J?1my] or disabled\r\n");
}
