// What reaches people's terminals.

#include "output/output.h"
#include "support.h"

using namespace bakjob::ctl;

TEST(Output, NothingThatATerminalActsOnIsPrinted)
{
    const std::map<std::string, std::string> cases = {
        {"plain text", "plain text"},
        {"a\033[2Jb", "a?[2Jb"},
        {"a\tb\nc\rd\177", "a?b?c?d?"},
        {"a\xC2\x9B 2J", "a? 2J"}, // C1 in UTF-8
        {"gr\xC3\xBC\xC3\x9F", "gr\xC3\xBC\xC3\x9F"},
        {"\xC2\xA0", "\xC2\xA0"},
        {"\xE2\x82\xAC \xF0\x9F\x98\x80", "\xE2\x82\xAC \xF0\x9F\x98\x80"},
        {"\2332J", "?2J"}, // C1 by itself, for terminals that take bytes
        {"\xC3\xBC\2332J", "\xC3\xBC?2J"},
        {"\xE2\2332J", "??2J"},              // cut
        {"\xC0\xAF \xED\xA0\x80", "?? ???"}, // too long a form, half of a pair
        {"a\xE2\x80\xAE!", "a?!"},           // turns the direction of writing
    };
    for (const auto &[text, shown] : cases)
        EXPECT_EQ(bakjob::printable(text), shown);
}

TEST(Output, TextsFitByCharactersNotBytes)
{
    const std::string text = "a\303\274\342\202\254b";
    const std::vector<std::string> starts = {"", "a", "a\xC3\xBC", "a\xC3\xBC\xE2\x82\xAC", text, text};
    for (std::size_t columns = 0; columns < starts.size(); ++columns)
        EXPECT_EQ(fitting(text, columns), starts[columns]) << columns;

    EXPECT_EQ(printed_by([] {
                  print_table({"NAME", "X"}, {{"gr\303\274\303\237e", "1"}, {"a", ""}, {"b\033", "2"}});
              }),
              "NAME   X\ngr\303\274\303\237e  1\na\nb?     2\n");
    EXPECT_EQ(printed_by([] { print_table({}, {{""}, {"", "x"}}); }), "\n  x\n");
}

// The trace of a hostile name is for whoever reads a file as it is, and harmless for whoever sits at a
// terminal.
TEST_F(Appliance, ATraceDoesNotActOnATerminal)
{
    write_file("/tmp/trace", "#!/bin/bash\n/usr/sbin/bakjob -d -r $'x\\e[2J\\xc2\\x9b1my'\n");
    EXPECT_EQ(shell("bash /tmp/trace").output,
              "OPEN DEBUG MODE!!\nERROR: not found this job_name [x\033[2J\xc2\x9b"
              "1my] or disabled\n");
    EXPECT_EQ(shell("script -qec 'bash /tmp/trace' /dev/null </dev/null").output,
              "OPEN DEBUG MODE!!\r\nERROR: not found this job_name [x?[2J?1my] or disabled\r\n");
}
