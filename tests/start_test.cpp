// Programs that somebody starts with handles closed, signals ignored or nobody to read what they say.

#include "ctl_support.h"

#include <cstring>
#include <fcntl.h>
#include <pty.h>
#include <sys/wait.h>
#include <termios.h>
#include <unistd.h>
#include <utmp.h>

namespace
{

using Start = CtlDaily;

constexpr const char *LOCK = "/tmp/rsync_write_conf.lock";

} // namespace

TEST_F(Start, ClosedHandlesAreNobodysFiles)
{
    const std::string closed = " <&- >&- 2>&-";
    unlink(LOCK);
    {
        const Fake rsync(RSYNC, "for i in 0 1 2; do [ -e /proc/$$/fd/$i ] || echo $i >>/tmp/closed; done\n"
                                "exec /usr/sbin/rsync.real \"$@\"\n");
        EXPECT_EQ(shell("/usr/sbin/bakjob -d -r daily" + closed).status, 0);
    }
    EXPECT_EQ(job_key(1, "state"), "2");
    EXPECT_FALSE(exists("/tmp/closed")) << "a transfer would write its messages into files of its own";
    EXPECT_EQ(read_file(LOCK), "");
    EXPECT_EQ(read_file("/remote/backup/S1_remote_backup/daily/Public/file"), "x");
    unlink(LOCK);
    EXPECT_EQ(shell("/usr/sbin/bakjobctl list" + closed).status, 0);
    EXPECT_EQ(shell("/usr/sbin/bakjobctl check daily --probe" + closed).status, 0);
    EXPECT_EQ(shell("/usr/sbin/bakjobctl set nobody retry=1" + closed).status, 3);
    EXPECT_EQ(read_file(LOCK), "");
}

TEST_F(Start, ExitCodesAreCollectedWhereAParentIgnoresThem)
{
    const std::string ignoring = "bash -c 'trap \"\" CHLD; exec /usr/sbin/";
    EXPECT_EQ(shell(ignoring + "bakjob -r daily'").status, 0);
    EXPECT_EQ(job_key(1, "state"), "2");
    EXPECT_TRUE(says(shell(ignoring + "bakjobctl check daily --probe'"), 0, "lets the job in"));
}

TEST_F(Start, ATraceThatNobodyReadsStopsNoBackup)
{
    const Ran ran = shell("bash -c '{ until [ -e /tmp/gone ]; do sleep 0.01; done; "
                          "/usr/sbin/bakjob -d -r daily; echo $? >/tmp/status; } | "
                          "{ exec <&-; touch /tmp/gone; }' 2>&1");
    EXPECT_EQ(read_file("/tmp/status"), "0\n") << ran.output;
    EXPECT_EQ(job_key(1, "state"), "2");
    EXPECT_FALSE(exists(PID_FILE));
}

TEST_F(Start, WhatCannotBeSaidIsAFailure)
{
    for (const char *command : {"list", "list --json", "show daily", "status", "keys"}) {
        const Ran ran = shell("/usr/sbin/bakjobctl " + std::string(command) + " 2>&1 >/dev/full");
        EXPECT_TRUE(says(ran, 3, "bakjobctl: standard output: No space left on device\n")) << command;
    }
}

TEST_F(Start, APasswordIsNotShownWhereItIsTyped)
{
    int terminal = -1;
    int inner = -1;
    ASSERT_EQ(openpty(&terminal, &inner, nullptr, nullptr, nullptr), 0);
    const auto echoes = [&] {
        termios settings{};
        return tcgetattr(inner, &settings) == 0 && (settings.c_lflag & ECHO) != 0;
    };
    ASSERT_TRUE(echoes());
    const pid_t person = fork();
    if (person == 0) {
        login_tty(inner);
        execl("/usr/sbin/bakjobctl", "bakjobctl", "set", "daily", "rsync_pwd=-", nullptr);
        _exit(127);
    }
    EXPECT_TRUE(eventually([&] { return !echoes(); }));
    EXPECT_EQ(write(terminal, "hunter2\n", 8), 8);
    int status = -1;
    EXPECT_TRUE(eventually([&] { return waitpid(person, &status, WNOHANG) == person; }));
    EXPECT_EQ(status, 0);
    EXPECT_TRUE(echoes()) << "as it was";
    fcntl(terminal, F_SETFL, O_NONBLOCK);
    char shown[256] = "";
    EXPECT_GT(read(terminal, shown, sizeof shown - 1), 0);
    EXPECT_STREQ(shown, "daily: rsync_pwd: \r\n");
    EXPECT_EQ(job_key(1, "rsync_pwd"), "aHVudGVyMg==");
    close(inner);
    close(terminal);
}
