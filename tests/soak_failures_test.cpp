// A remote side that misbehaves, a disk that is full or goes away: failed folders, each with its alert.

#include "soak_support.h"

#include <csignal>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

struct RemoteSide {
    std::string what;
    std::function<void(int)> behave;
    std::string client; // in the place of rsync, which reads a greeting byte by byte
    int seconds;        // the longest that a run may take
};

// Whether a run ends as a failed folder, and did not keep in memory what it was sent.
bool run_fails_in_order(const RemoteSide &one)
{
    const BadServer server(one.behave);
    EXPECT_TRUE(server.bound());
    const Fake rsync(RSYNC, one.client.empty() ? "exec /usr/sbin/rsync.real \"$@\"\n" : one.client);
    add_job({{"remote_ip", "127.0.0.9"}});
    const pid_t run = start({"-d", "-r", "daily"});
    rusage usage{};
    int status = -1;
    if (!eventually([&] { return wait4(run, &status, WNOHANG, &usage) == run; }, one.seconds))
        kill(run, SIGKILL);
    const bool well =
        status == 0 && job_key(1, "state") == "4" && alerts().size() == 1 && usage.ru_maxrss < 64'000;
    EXPECT_TRUE(well) << one.what << " state " << job_key(1, "state") << " kB " << usage.ru_maxrss
                      << read_file("/tmp/output").substr(0, 3000);
    return well;
}

} // namespace

TEST_F(Holds, AMisbehavingRemoteSideIsAFailedFolder)
{
    // The one on 873 takes every address, this one is more special.
    shell("pkill -f '[r]sync --daemon'");
    ASSERT_TRUE(eventually([] { return shell("pgrep -f '[r]sync --daemon'").output.empty(); }));
    const std::string size = std::to_string(rounds(2'000'000, 100'000'000));
    const auto nothing = [](int) {};
    const std::vector<RemoteSide> sides = {
        {"a host that accepts and never answers", [](int) { sleep(600); }, "", 400},
        {"a host that drops the connection at once", nothing, "", 60},
        {"a host that drops it in mid-reply", [](int c) { (void)!write(c, "@RSYNCD: 31.0 md5\nmod", 21); },
         "", 60},
        {"a daemon that prints 100 MB", nothing, "yes | head -c " + size + "; exit 5\n", 60},
        {"a daemon that prints a line without end", nothing,
         "head -c " + size + " /dev/zero | tr '\\0' x; exit 5\n", 60}};
    for (const RemoteSide &one : sides) {
        if (one.seconds > 60 && soak_table() == nullptr) continue; // only time-outs end it
        SetUp();
        expect_none_of(1, run_fails_in_order(one) ? 0 : 1, one.what);
    }
    shell("/usr/bin/rsync --daemon --config=/etc/rsyncd.conf </dev/null >/dev/null 2>&1");
}

TEST_F(Holds, AFullOrMissingDiskIsAFailedFolder)
{
    add_job({});
    write_file(SHARE + "/big", std::string(4'000'000, 'x'));
    shell("mount -t tmpfs -o size=1m full /remote/backup && mkdir -p /remote/backup/S1_remote_backup/daily");
    traced({"-r", "daily"});
    shell("umount /remote/backup");
    const bool full = job_key(1, "state") == "4" && alerts().size() == 1;
    expect_none_of(1, full ? 0 : 1, "a full target disk");

    SetUp();
    shell("mount -t tmpfs share " + SHARE + " && cd " + SHARE + " && mkdir a b && touch a/x");
    add_job({{"local_path", SHARE + "/a:" + SHARE + "/b"}});
    const std::string kept = "/remote/backup/S1_remote_backup/daily/Public/b/kept";
    write_file(kept, "x");
    {
        const Fake rsync(RSYNC, KIND_OF_CALL +
                                    "/usr/sbin/rsync.real \"$@\"; code=$?\n[ $kind != run ] || umount -l " +
                                    SHARE + "\nexit $code\n");
        traced({"-r", "daily"});
    }
    shell("umount -l " + SHARE + " 2>/dev/null");
    const auto raised = alerts();
    const bool well = raised.size() == 2 && raised[0].starts_with("1 2402") &&
                      raised[1].starts_with("1 1400") && exists(kept);
    EXPECT_TRUE(well) << read_file("/tmp/output");
    expect_none_of(1, well ? 0 : 1, "a share unmounted in mid-run: nothing deleted remotely");
}
