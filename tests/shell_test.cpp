#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "support.h"

#include <csignal>
#include <unistd.h>

using namespace bakjob;

using Shell = Appliance;

TEST_F(Shell, ReportsHowACommandEnded)
{
    EXPECT_EQ(run_shell("true"), 0);
    EXPECT_EQ(exit_code(run_shell("exit 23")), 23);
    EXPECT_EQ(exit_code(run_shell("kill -9 $$")), 128 + SIGKILL);
    EXPECT_EQ(exit_code(run_shell("/no/such/program 2>/dev/null")), 127);
    ShellReader reader("echo one; exit 5");
    std::string line;
    EXPECT_TRUE(reader.read_line(line));
    EXPECT_EQ(line, "one");
    EXPECT_EQ(exit_code(reader.close()), 5);
}

TEST_F(Shell, CommandsSeeAFixedWorld)
{
    setenv("LC_ALL", "de_DE.UTF-8", 1);
    setenv("SMUGGLED", "1", 1);
    write_file("/tmp/here/a[b]", "");
    ASSERT_EQ(chdir("/tmp/here"), 0);
    EXPECT_EQ(first_reply_line("env | grep -c SMUGGLED"), "0");
    EXPECT_EQ(first_reply_line("echo $LC_ALL $PATH"),
              "C /usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin");
    EXPECT_EQ(first_reply_line("echo * [a]*"), "* [a]*") << "no file-name patterns";
    EXPECT_EQ(first_reply_line("cat; echo end"), "end") << "nothing on standard input";
}

// The program ignores broken pipes, and interrupts while it waits: a command must not inherit that, but what
// the program itself was told to ignore.
TEST_F(Shell, CommandsEndBySignalsAsTheCallerWould)
{
    const auto ended_by = [](int signal) {
        return exit_code(run_shell("kill -" + std::to_string(signal) + " $$; exit 5")) - 128;
    };
    const auto at_pipe = std::signal(SIGPIPE, SIG_IGN);
    for (const int signal : {SIGPIPE, SIGINT, SIGQUIT})
        EXPECT_EQ(ended_by(signal), signal);
    EXPECT_EQ(first_reply_line("kill -PIPE $$; echo lives"), "");
    const auto at_interrupt = std::signal(SIGINT, SIG_IGN);
    EXPECT_EQ(ended_by(SIGINT), 5 - 128);
    EXPECT_EQ(std::signal(SIGINT, at_interrupt), SIG_IGN) << "as it was before the command";
    std::signal(SIGPIPE, at_pipe);
    const auto at_size = std::signal(SIGXFSZ, SIG_IGN);
    EXPECT_EQ(first_reply_line("ulimit -f 0; sh -c 'echo x >/tmp/x' || echo $?"), "153");
    std::signal(SIGXFSZ, at_size);
}

TEST_F(Shell, OnlyTheFirstLineOfAReplyCounts)
{
    EXPECT_EQ(first_reply_line("echo 'a b \t'; echo c"), "a b");
    EXPECT_EQ(first_reply_line("true"), "");
    EXPECT_EQ(first_reply_line("head -c 3000 /dev/zero | tr '\\0' x"), std::string(1023, 'x'));
    // The command must get rid of all its output, however much, and end.
    EXPECT_EQ(first_reply_line("echo first; head -c 3000000 /dev/zero; touch /tmp/ended"), "first");
    EXPECT_TRUE(exists("/tmp/ended"));
}

TEST_F(Shell, QuotedNamesReachTheProgramAsTheyAre)
{
    const std::vector<std::string> names = {"plain",          "My Photos (2013)",
                                            " it's 100% #1 ", "$(touch pwned)",
                                            "`reboot`",       "a;b&c",
                                            "a=b^c+{d}[e]",   "-rf",
                                            "~root",          "caf\xc3\xa9",
                                            "\xff\xfe",       "!x"};
    for (const std::string &name : names) {
        ASSERT_TRUE(is_job_name(name)) << name;
        const std::string file = "/tmp/r_" + name;
        for (const std::string &word :
             {shell_word(file), in_double_quotes(file), in_single_quotes(file), *shell_path("x", file)}) {
            EXPECT_EQ(shell("printf %s " + word).output, file);
            EXPECT_EQ(shell("echo \"`printf %s " + in_backquotes(word) + "`\"").output, file + "\n");
            // What ssh hands to the shell at the other end is read once more.
            EXPECT_EQ(shell("sh -c " + in_single_quotes("printf %s " + word)).output, file);
        }
    }
    EXPECT_EQ(shell_word("daily"), "daily");
    EXPECT_EQ(shell_word("a+b=c%d^e"), "a+b=c%d^e") << "no shell acts on these";
    EXPECT_EQ(grep_word("a+b=c%d"), "a+b=c%d");
    EXPECT_FALSE(exists("pwned"));
}

TEST_F(Shell, ASearchedNameIsNoPattern)
{
    for (const std::string name : {"a.b", "a[b]", "^a$", "it's", "a b", "$x`", "x(y)+{1}"}) {
        const std::string find = "grep -c job-name=" + grep_word(name);
        EXPECT_EQ(shell("printf 'x job-name=%s y\\n' " + shell_word(name) + " | " + find).output, "1\n")
            << name;
        EXPECT_EQ(shell("echo \"`printf 'job-name=%s\\n' " + in_backquotes(shell_word(name)) + " | " +
                        in_backquotes(find) + "`\"")
                      .output,
                  "1\n")
            << name;
        EXPECT_EQ(shell("printf 'job-name=aXb job-name=ab\\n' | " + find).output, "0\n") << name;
    }
    EXPECT_EQ(grep_word("daily-2_x"), "daily-2_x");
    EXPECT_EQ(grep_word("a.b"), "'a\\.b'");
}

TEST_F(Shell, WhatCannotBeQuotedIsRefused)
{
    for (const std::string name :
         {"", ".", "..", "a/b", "a\nb", "a\tb", "a\"b", "a\\b", "a|b", "a<b", "a>b", "a*", "a?"}) {
        EXPECT_FALSE(is_job_name(name)) << name;
        EXPECT_FALSE(JobName::checked(name)) << name;
    }
    EXPECT_TRUE(is_job_name(std::string(127, 'x')));
    EXPECT_FALSE(is_job_name(std::string(128, 'x')));
    for (const std::string path :
         {"/a\"b", "/a\\b", "/a|b", "/a<b", "/a>b", "/a*", "/a?", "/a\tb", "/a\nb", "-rf", "~root"})
        EXPECT_FALSE(shell_path("x", path)) << path;
    EXPECT_TRUE(shell_path("x", std::string(1023, 'a')));
    EXPECT_FALSE(shell_path("x", std::string(1024, 'a')));
    EXPECT_FALSE(shell_path("x", std::string(512, ' '))) << "too long once escaped";

    for (const std::string host :
         {"-oProxyCommand=x", "a b", "a;b", "$(x)", "`x`", "a'b", "a\nb", "a/b", "a@b", "[::1]"})
        EXPECT_TRUE(refusal_of_host(host)) << host;
    for (const std::string host : {"10.0.0.1", "nas-2.example", "fe80::1", "fe80::1%eth0"})
        EXPECT_FALSE(refusal_of_host(host)) << host;
    for (const std::string user : {"-l", "a b", "a:b", "a/b", "a&b", "a\"b"})
        EXPECT_TRUE(refusal_of_rsync_user(user)) << user;
    EXPECT_FALSE(refusal_of_rsync_user("bk@example.org"));
    EXPECT_FALSE(refusal_of_ssh_user("CORP/jd"));
    EXPECT_TRUE(refusal_of_ssh_user("ssh://x"));
    EXPECT_EQ(shell_path_part("x", "-rf"), "-rf");
    EXPECT_FALSE(refusal_of_port("873  "));
    EXPECT_TRUE(refusal_of_port("8 73"));
    EXPECT_TRUE(refusal_of_port("873;x"));
    EXPECT_FALSE(refusal_of_base64("x", "cGFrdG8="));
    EXPECT_TRUE(refusal_of_base64("x", "a'b"));
}

// A path that the shell of the remote host reads as it is: also a C shell, which people over there may have.
TEST_F(Shell, APathIsRefusedOnlyForWhatAShellActsOnWhereItStands)
{
    for (const std::string path :
         {"/v/#recycle", "/v/C#", "/v/a~b", "/v/wow!", "a+b", "100%", "a=b", "x^y", "/v/caf\xc3\xa9"}) {
        EXPECT_FALSE(refusal_for_shells("x", path)) << path;
        for (const char *program : {"sh", "bash", "csh"}) {
            if (shell(std::string("command -v ") + program).status != 0) continue;
            const std::string command = "printf '[%s]' " + path + " 2>&1";
            EXPECT_EQ(shell(std::string(program) + " -c " + in_single_quotes(command)).output,
                      "[" + path + "]")
                << program;
        }
    }
    for (const std::string path : {"#recycle", "~root", "=ls", "^a", "%1", "a!b", "a=~root", "a:~root", "-rf",
                                   "a b", "a$b", "a;b", "a(b", "a'b", "a\nb", "a{b,c}", "a[b]", ""})
        EXPECT_EQ(!refusal_for_shells("x", path), path.empty()) << path;
}
