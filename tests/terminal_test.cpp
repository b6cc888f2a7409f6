// What reaches a terminal: nothing but what it shows.

#include "support.h"

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
