// bash's completion of bakjobctl, as bash calls it.

#include "ctl_support.h"

#include <filesystem>

namespace
{

using Completion = Ctl;

// What is offered for the last of the words, which may be empty.
std::string offered(const std::string &words)
{
    write_file("/tmp/complete", "source /usr/share/bash-completion/completions/bakjobctl\n"
                                "COMP_WORDS=(bakjobctl " +
                                    words +
                                    ")\nCOMP_CWORD=$((${#COMP_WORDS[@]} - 1))\n"
                                    "$(complete -p bakjobctl | sed 's/.*-F \\([^ ]*\\).*/\\1/') "
                                    "2>/dev/null\nprintf '%s\\n' \"${COMPREPLY[@]}\"\n");
    return shell("bash /tmp/complete").output;
}

} // namespace

TEST_F(Completion, OffersWhatTheCommandLineTakes)
{
    for (const char *name : {"daily", "data", "weekly", "it's \\$x"})
        ASSERT_TRUE(says(add("\"" + std::string(name) + "\""), 0, ""));
    EXPECT_EQ(offered("st"), "status\n");
    EXPECT_EQ(offered("show da"), "daily\ndata\n");
    EXPECT_EQ(offered("show it"), "it\\'s\\ \\$x\n");
    EXPECT_EQ(offered("check daily --p"), "--probe\n");
    EXPECT_EQ(offered("list --"), "--help\n--json\n--names\n");
    EXPECT_EQ(offered("set daily retr"), "retry=\nretry_interval=\n");
    EXPECT_EQ(offered("add da"), "\n") << "a new name is nobody's to offer";
}

TEST_F(Completion, KnowsEveryCommand)
{
    const std::string commands =
        shell("bakjobctl --help | sed -n '/^Subcommands:/,$ s/^  \\([a-z]*\\)  *.*/\\1/p'").output;
    EXPECT_GT(lines_of(commands).size(), 10U) << commands;
    EXPECT_EQ(offered("''"), commands + "--help\n--version\n");
}
