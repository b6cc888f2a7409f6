// The stand-in programs, against the real rsync daemon and the real ssh server of the remote side.

#include "process_support.h"

#include <algorithm>
#include <filesystem>
#include <unistd.h>

namespace fs = std::filesystem;

namespace
{

// What the callers judge: the first line of both outputs. Nothing may take more than a moment.
std::string first_line(const std::string &command)
{
    std::string line = shell("timeout 20 " + command + " 2>&1 </dev/null | head -1").output;
    line.erase(line.find_last_not_of("\r\n") + 1);
    return line;
}

int count_lines(const std::string &text, const std::vector<std::string> &parts)
{
    const auto lines = lines_of(text);
    return static_cast<int>(std::count_if(lines.begin(), lines.end(), [&](const std::string &line) {
        return std::all_of(parts.begin(), parts.end(),
                           [&](const std::string &part) { return line.find(part) != std::string::npos; });
    }));
}

std::string far_end()
{
    const auto lines = lines_of(read_file("/run/remote_link_local"));
    return lines.empty() ? "" : lines.front() + "%egiga0";
}

class Programs : public Appliance
{
protected:
    void SetUp() override
    {
        Appliance::SetUp();
        shell("rm -f ~root/.ssh/known_hosts");
    }
};

TEST_F(Programs, SshSaysFirstWhatTheStockClientHasToSay)
{
    const std::string denied = "root@127.0.0.1: Permission denied (publickey,password).";
    const std::vector<std::pair<std::string, std::string>> first_contact = {
        {"-d cm9vdHB3 root@127.0.0.1 echo hello", "hello"},
        {"-dYmtwdw== bk@::1 whoami", "bk"},
        {"-d d3Jvbmc= root@127.0.0.1 echo hello", denied},
        {"root@127.0.0.1 echo hello", denied},
        {"-d '' root@127.0.0.1 echo hello", denied},
        {"-d '*' root@127.0.0.1 echo hello", "ssh: the password after -d is not base64 text"},
        {"-p 2 root@127.0.0.1 echo hello", "ssh: connect to host 127.0.0.1 port 2: Connection refused"},
        {"-c none-such -d cm9vdHB3 root@127.0.0.1 echo hello", "hello"},
        {"-c none-such,aes128-ctr -d cm9vdHB3 root@127.0.0.1 echo -d x", "-d x"},
    };
    for (const auto &[arguments, line] : first_contact) {
        shell("rm -f ~root/.ssh/known_hosts");
        EXPECT_EQ(first_line("/usr/sbin/ssh " + arguments), line) << arguments;
    }
    EXPECT_EQ(first_line("/usr/sbin/ssh -d cm9vdHB3 root@127.0.0.1 echo again"), "again");
    EXPECT_EQ(first_line("/usr/sbin/ssh -d cm9vdHB3 root@" + far_end() + " echo far"), "far");

    shell("ssh-keygen -q -t ed25519 -N '' -f /tmp/key && (printf '127.0.0.1 '; cat /tmp/key.pub) "
          ">~root/.ssh/known_hosts");
    EXPECT_EQ(first_line("/usr/sbin/ssh -d cm9vdHB3 root@127.0.0.1 echo hello"), std::string(59, '@'));
}

TEST_F(Programs, NoProcessShowsTheLoginPassword)
{
    shell("/usr/sbin/ssh -d cm9vdHB3 root@127.0.0.1 'sleep 3.14' >/dev/null 2>&1 &");
    std::string processes; // of the whole time until the command runs over there
    EXPECT_TRUE(eventually([&] {
        processes += shell("ps -ww").output;
        return shell("pgrep -fx 'sleep 3.14'").status == 0;
    })) << processes;
    EXPECT_GT(count_lines(processes, {"/usr/bin/ssh"}), 0) << processes;
    EXPECT_EQ(count_lines(processes, {"/usr/bin/ssh", "cm9vdHB3"}), 0) << processes;
    EXPECT_EQ(processes.find("rootpw"), std::string::npos) << processes;
}

TEST_F(Programs, ATransferShowsItsJobInEveryProcess)
{
    write_file("/tmp/from/file", std::string(1'000'000, 'x'));
    shell("/usr/sbin/rsync --job-name='my job' --dump-size --bwlimit=10 /tmp/from/file /tmp/to >/dev/null "
          "2>&1 &");
    std::string processes;
    const std::vector<std::string> parts = {"/usr/sbin/rsync", "job-name=my job", "--bwlimit=10"};
    EXPECT_TRUE(eventually([&] {
        processes = shell("ps -ww").output;
        return count_lines(processes, parts) == 4;
    })) << processes;
    for (const std::string &line : lines_of(processes))
        if (line.find("job-name=my job") != std::string::npos)
            shell("kill " + std::to_string(std::stol(line)));
    EXPECT_TRUE(eventually([&] { return count_lines(shell("ps").output, parts) == 0; }));
}

TEST_F(Programs, ATransferPublishesItsFigures)
{
    for (int i = 0; i < 30; ++i)
        write_file("/mnt/HD/x/" + std::to_string(i), std::string(1000, 'x'));
    write_file("/tmp/other", "untouched");
    shell("ln -s /tmp/other '/tmp/r_it'\\''s 1'; ln -s /tmp/other '/tmp/r_it'\\''s 1.dump_size'");
    const std::string rsync = "/usr/sbin/rsync --job-name=it\\'s\\ 1 -aHq8 --dump-size ";
    const std::string ends = "/mnt/HD/x/ 127.0.0.1::data 2>/dev/null";
    const std::string moved = "                  30                30000\n";
    EXPECT_EQ(shell(rsync + "--dry-run " + ends).output, "");
    EXPECT_FALSE(exists("/tmp/r_it's 1.dump_size")) << "known when all is moved";
    EXPECT_FALSE(exists("/remote/data/29"));
    EXPECT_EQ(shell(rsync + ends).output, "");
    EXPECT_EQ(read_file("/tmp/r_it's 1"), moved + "                3100                 3100\n");
    EXPECT_EQ(read_file("/tmp/r_it's 1.dump_size"), moved);

    // More files than may be listed at once; those that are there already are not moved.
    for (int i = 30; i < 300; ++i) {
        write_file("/mnt/HD/x/" + std::to_string(i), std::string(1000, 'x'));
    }
    EXPECT_EQ(shell("DEVICE_MOST_LISTED=150 " + rsync + ends).status, 0);
    EXPECT_TRUE(exists("/remote/data/299"));
    EXPECT_EQ(read_file("/tmp/r_it's 1.dump_size"), "                 270               270000\n");
    EXPECT_EQ(read_file("/tmp/r_it's 1").substr(42), "               30100                30100\n");
    EXPECT_EQ(read_file("/tmp/other"), "untouched");

    // However a transfer ends, its caller hears of it.
    EXPECT_EQ(shell(rsync + "/mnt/HD/none " + ends).status, 23);
    EXPECT_EQ(shell(rsync + "/mnt/HD/x/ 127.0.0.1::none 2>/dev/null").status, 5);
    EXPECT_FALSE(exists("/tmp/r_it's 1.dump_size")) << "it did not come to its end";
    EXPECT_EQ(shell("/usr/sbin/rsync --job-name=a/b --dump-size -aq8 " + ends).status, 0);
}

// The dry run of a job tries the start alone, and what it says is what the whole one says.
TEST_F(Programs, ADryRunOfAJobFailsAsTheWholeOneDoes)
{
    shell("mkdir -p /mnt/HD/many /mnt/HD/empty /mnt/HD/there /remote/data/there && cd /mnt/HD && "
          "seq 120 | split -l1 -a3 - many/ && echo x >file && ln -s none dangling && "
          "cp -r file many empty dangling /remote/data && cp -r many file /remote/archive");
    struct Case {
        std::string source, target;
        int status;
    };
    const std::string data = "127.0.0.1::data/", shelled = "root@127.0.0.1:/remote/data/", here = "/mnt/HD/";
    std::vector<Case> cases = {
        {here + "many/", "127.0.0.1::archive/there", 1},
        {"127.0.0.1::archive/many/", here + "there", 0},
        {here + "many/", "127.0.0.1::backup/x", 5},
        {"127.0.0.1::nomodule/many/", here + "there", 5},
        {here + "many/", "rsync://127.0.0.1:2/data/there", 10},
    };
    for (const auto &[from, to] : {std::pair(here, data), {data, here}, {here, shelled}, {shelled, here}}) {
        cases.push_back({from + "none/", to + "there", 23});
        cases.push_back({from + "many/", to + "none/none", 0});
        cases.push_back({from + "empty/", to + "none/none", 3});
        if (from == shelled || to == shelled) continue;
        cases.push_back({from + "none/none", to + "there", 23});
        cases.push_back({from + "many/", to + "file", 3});
        cases.push_back({from + "many/", to + "dangling", 0});
        cases.push_back({from + "file", to + "none/none", 3});
        cases.push_back({from + "file/", to + "none", 23});
    }
    for (const Case &one : cases) {
        const bool daemon = (one.source + one.target).find("root@") == std::string::npos;
        const std::string command = std::string("/usr/sbin/rsync --job-name=j -aHq8 --delete ") +
                                    (daemon ? "" : "-e '/usr/sbin/ssh -d cm9vdHB3' ") + one.source + " " +
                                    one.target + " --dry-run </dev/null >/dev/null 2>&1";
        EXPECT_EQ(shell(command).status, one.status) << "the whole one: " << command;
        EXPECT_EQ(shell(command + " --dump-size").status, one.status) << command;
    }
    for (const char *command : {"/usr/sbin/rsync --job-name=j -av --dump-size --dry-run --delete ",
                                "BAKJOB_RUN=1 /usr/sbin/rsync -av --dry-run "}) {
        for (const std::string &ends : {data + "many/ /mnt/HD/there", here + "many/ " + data + "there"}) {
            const Ran ran = shell(command + ends);
            EXPECT_EQ(ran.status, 0) << command << ends;
            EXPECT_EQ(ran.output.find("aaa"), std::string::npos) << "it goes into no folder: " << command;
        }
    }
}

TEST_F(Programs, RsyncReachesEveryKindOfPlaceAndAsksNothing)
{
    write_file("/remote/data/file", "x");
    const std::string stock = "rsync -e '/usr/sbin/ssh -d cm9vdHB3' ";
    for (const std::string &command :
         {std::string("rsync 127.0.0.1::data/file"), std::string("rsync '[::1]::data/file'"),
          std::string("rsync rsync://127.0.0.1/data/file"), stock + "root@127.0.0.1:/remote/data/file",
          stock + "'root@[::1]:/remote/data/file'", stock + "127.0.0.1::data/file",
          std::string("RSYNC_PASSWORD=secret rsync bk@127.0.0.1::backup"),
          std::string("RSYNC_PASSWORD=cGFrdG8= rsync root@127.0.0.1::backup")}) {
        const Ran ran = shell("(" + command + ") 2>&1 </dev/null");
        EXPECT_EQ(ran.status, 0) << command << "\n" << ran.output;
    }
    EXPECT_EQ(first_line("rsync bk@127.0.0.1::backup"), "@ERROR: auth failed on module backup");
    EXPECT_EQ(first_line("rsync bk@127.0.0.1:/remote"),
              "bk@127.0.0.1: Permission denied (publickey,password).");
}

TEST_F(Programs, PsShowsOneLineAProcessOfAnyLength)
{
    shell("sh -c 'sleep 5; : \"a\nb\"' \"$(head -c 90000 /dev/zero | tr '\\0' z)\" end >/dev/null 2>&1 &");
    std::string processes;
    EXPECT_TRUE(eventually([&] {
        processes = shell("ps -ww").output;
        return count_lines(processes, {"sleep 5; : \"a b\" zzz", "zzz end"}) == 1;
    })) << processes.substr(0, 2000);
}

constexpr const char *BOUND = "BAKJOB_RUN=1 DEVICE_PROBE_SECONDS=1 ";

TEST_F(Programs, AProbeEndsWhateverGoesOnForEver)
{
    // One byte in a while, and lines without end behind a greeting.
    const BadServer drips(
        [](int c) {
            while (write(c, "x", 1) == 1)
                usleep(200'000);
        },
        8731);
    const BadServer lists(
        [](int c) {
            (void)!write(c, "@RSYNCD: 31.0\n", 14);
            while (write(c, "module\n", 7) == 7)
                usleep(1000);
        },
        8732);
    ASSERT_TRUE(drips.bound() && lists.bound());
    struct Case {
        std::string command;
        std::string status;
        std::string says;
    };
    const std::vector<Case> cases = {
        {"rsync --port=8731 127.0.0.9::", "30\n", ""},
        {"rsync --port=8732 127.0.0.9::", "30\n", "module"},
        {"rsync --job-name=j --port=8731 -a 127.0.0.9::m/ /tmp --dump-size --dry-run", "30\n", ""},
        {"ssh -d cm9vdHB3 root@127.0.0.1 'while echo line; do sleep 0.1; done'", "255\n", "line"},
        {"rsync -n -e 'sh -c \"setsid sleep 4711 & sleep 4711\"' x:y /tmp", "30\n", ""}};
    int number = 0;
    for (const Case &one : cases) {
        const std::string file = "/tmp/" + std::to_string(++number);
        shell("/usr/sbin/" + one.command + " >/tmp/unmarked 2>&1 </dev/null & echo $! >" + file + ".pid");
        shell("{ " + (BOUND + ("timeout 20 /usr/sbin/" + one.command)) + " >" + file + " 2>&1; echo $? >" +
              file + ".status; } >/dev/null 2>&1 &");
    }
    number = 0;
    for (const Case &one : cases) {
        const std::string file = "/tmp/" + std::to_string(++number);
        EXPECT_TRUE(eventually([&] { return read_file(file + ".status") == one.status; })) << one.command;
        EXPECT_TRUE(read_file(file).starts_with(one.says)) << one.command;
        EXPECT_FALSE(has(read_file(file), "error")) << one.command;
        EXPECT_EQ(shell("kill $(cat " + file + ".pid)").status, 0) << "nobody's probe: " << one.command;
    }
    end_waits();
    EXPECT_TRUE(eventually([] { return left_processes().empty(); })) << left_processes();
}

TEST_F(Programs, TheBoundOfAProbeChangesNothingElse)
{
    const std::string ssh = BOUND + SSH + " -d cm9vdHB3 root@127.0.0.1 ";
    EXPECT_EQ(shell(ssh + "'echo x; exit 7'").status, 7);
    EXPECT_EQ(shell("echo in | " + ssh + "cat").output, "in\n");
    EXPECT_EQ(shell(BOUND + RSYNC + " /no/such/file /tmp 2>/dev/null").status, 23);

    // Transfers take as long as they take.
    write_file("/tmp/from/file", std::string(15'000, 'x'));
    const std::string transfer =
        BOUND + RSYNC + " --job-name=daily --bwlimit=10 -aq8 -e '/usr/sbin/ssh -d cm9vdHB3' /tmp/from/file ";
    shell(transfer + "/tmp/here & " + transfer + "root@127.0.0.1:/tmp/there; wait");
    EXPECT_EQ(fs::file_size("/tmp/here"), 15'000U);
    EXPECT_EQ(fs::file_size("/tmp/there"), 15'000U);
}

} // namespace
