// What must hold however often it is tried: hostile values, kills in mid-save, races for one job, kills of
// runs, files placed beforehand, remote sides that misbehave.

#include "common/debug_log.h"
#include "common/run_options.h"
#include "config/current_job.h"
#include "config/job_list.h"
#include "config/job_state.h"
#include "config/job_store.h"
#include "platform/config_store.h"
#include "remote/discovery.h"
#include "soak_support.h"

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <random>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

constexpr const char *CONFIG = "/etc/NAS_CFG/config.xml";

// Names and contents of everything outside of a job's own places.
std::string elsewhere()
{
    const std::string own =
        "\\( -path 'tmp/r_*' -o -path tmp/output -o -path 'tmp/rsync_*' -o -path etc/NAS_CFG -o -path "
        "remote/backup "
        "-o -path remote/data -o -path mnt/HD/HD_a2/Public \\) -prune -o -type f -printf '%p %s %T@\\n' -o "
        "-printf '%p\\n' 2>/dev/null";
    return shell("cd / && { find tmp mnt remote home srv -xdev -mindepth 1 " + own +
                 "; find etc root run -xdev -mindepth 1 -maxdepth 1 " + own + "; } | sort")
        .output;
}

const std::vector<std::string> PAYLOADS = {";touch /tmp/pwned;",
                                           "|touch /tmp/pwned",
                                           "&touch /tmp/pwned&",
                                           "&&touch /tmp/pwned",
                                           "||touch /tmp/pwned",
                                           "$(touch /tmp/pwned)",
                                           "`touch /tmp/pwned`",
                                           "'; touch /tmp/pwned; '",
                                           "\"; touch /tmp/pwned; \"",
                                           "' $(touch /tmp/pwned) '",
                                           "\" `touch /tmp/pwned` \"",
                                           "\\\"; touch /tmp/pwned; \\\"",
                                           "x\ntouch /tmp/pwned\n",
                                           "x\rtouch /tmp/pwned",
                                           ">/tmp/pwned",
                                           ">>/tmp/pwned",
                                           "</dev/zero",
                                           "2>/tmp/pwned",
                                           "*",
                                           "?[a-z]*",
                                           "{a,b}",
                                           "~root",
                                           "-oProxyCommand=touch /tmp/pwned",
                                           "-e touch${IFS}/tmp/pwned",
                                           "--rsync-path=touch /tmp/pwned",
                                           "--rsh=touch${IFS}/tmp/pwned",
                                           "-rf",
                                           "../../../../tmp/pwned",
                                           "/../../../../tmp/pwned",
                                           "a\tb",
                                           " ",
                                           "",
                                           "${HOME}",
                                           "$$",
                                           "!!",
                                           "#",
                                           "%s%s%s%n",
                                           "f\xc3\xbc\xc3\x9f",
                                           "\xff\xfe\x80",
                                           std::string(3000, 'A'),
                                           std::string(200, '$')};

struct KindOfRun {
    const char *name;
    std::vector<std::string> arguments; // in front of -r and the name
    Keys keys;
};

const std::vector<KindOfRun> KINDS = {{"push", {}, {}},
                                      {"fetch", {}, {{"backup_type", "2"}, {"inc_enable", "1"}}},
                                      {"ssh",
                                       {},
                                       {{"use_ssh", "1"},
                                        {"rsync_mode", "1"},
                                        {"ssh_pwd", "rootpw"},
                                        {"remote_path", "/remote/data"},
                                        {"rsync_user", "root"}}},
                                      {"restore", {"-i", "x"}, {}},
                                      {"recover", {"-n", "1"}, {{"backup_type", "2"}, {"inc_enable", "1"}}}};

// Whether a failed run says why: by a refusal, or by the command that it tried last.
bool is_explained(const std::string &trace, const std::string &field, const std::string &value)
{
    if (field == "remote_ip" && value.empty()) return true; // nothing to say about no host
    const bool hostile = value.find_first_of("\"\\|<>*?\t\n\r") != std::string::npos;
    if (hostile && (field == "remote_ip" || field == "remote_path")) {
        return trace.find("ERROR: " + field + " refused") != std::string::npos;
    }
    const std::vector<std::string> reasons = {"ERROR: ", "--->[r",        "--->[s",
                                              "--->[@",  "rsync_cmd = [", "denied"};
    return std::any_of(reasons.begin(), reasons.end(),
                       [&](const std::string &reason) { return trace.find(reason) != std::string::npos; });
}

} // namespace

TEST_F(Holds, NoValueBecomesACommand)
{
    const std::vector<std::string> fields = {"job_name",   "rsync_user",  "ssh_user",
                                             "ssh_pwd",    "remote_ip",   "port",
                                             "local_path", "remote_path", "rsync_pwd_file"};
    const bool all = soak_table() != nullptr;
    int tries = 0;
    int failures = 0;
    for (std::size_t f = 0; f < fields.size(); ++f) {
        for (std::size_t p = 0; p < PAYLOADS.size(); ++p) {
            for (std::size_t k = 0; k < KINDS.size(); ++k) {
                if (!all && (f * 7 + p) % 15 != k * 3)
                    continue; // every pair of field and kind, not every triple
                SetUp();
                Keys keys = KINDS[k].keys;
                std::string value = PAYLOADS[p];
                if (fields[f] == "local_path") value = SHARE + std::string("/") + value;
                if (fields[f] == "rsync_pwd_file") value = "/tmp/r_" + value;
                if (fields[f] == "remote_path")
                    value = (keys.contains("use_ssh") ? "/remote/data/" : "backup/") + value;
                keys[fields[f]] = value;
                const int item = add_job(keys);
                const std::string name = job_key(item, "job_name");
                fs::create_directories(
                    std::string(SHARE) + "/" +
                    (name.size() < 100 && name.find('/') == std::string::npos ? name : "x") + ".0");
                std::vector<std::string> arguments = KINDS[k].arguments;
                arguments.insert(arguments.end(), {"-r", name});
                const std::string before = elsewhere();
                const std::string trace = traced(arguments);
                const std::string state = job_key(item, "state") + job_key(item, "rstate");
                const bool done = state == "20" || state == "02";
                const bool failed = state == "40" || state == "04" || state == "90" || state == "00";
                const bool no_snapshot = KINDS[k].name == std::string("recover") && state == "00";
                const bool ended =
                    done || no_snapshot || (failed && is_explained(trace, fields[f], keys[fields[f]]));
                wait_for(start({"-k", name}));
                ++tries;
                if (!ended || elsewhere() != before || exists("/tmp/pwned")) {
                    ++failures;
                    ADD_FAILURE() << fields[f] << " [" << PAYLOADS[p].substr(0, 60) << "] " << KINDS[k].name
                                  << " state " << state << "\n"
                                  << trace;
                }
            }
        }
    }
    expect_none_of(tries, failures, "hostile values in a job's fields");
}

TEST_F(Holds, NoModuleOfTheRemoteSideBecomesACommand)
{
    int failures = 0;
    const std::string own_config = read_file("/etc/rsyncd.conf");
    const int step = rounds(6, 1);
    int tries = 0;
    for (std::size_t p = 0; p < PAYLOADS.size(); p += static_cast<std::size_t>(step)) {
        SetUp();
        add_job({{"ssh_pwd", "cm9vdHB3"}, {"remote_path", "backup"}});
        write_file("/etc/rsyncd.conf", "[ " + PAYLOADS[p] +
                                           " ]\npath = /x\n[ backup ]\npath = /remote/backup/" + PAYLOADS[p] +
                                           "\n");
        const std::string before = elsewhere();
        traced({"-r", "daily"});
        ++tries;
        if (elsewhere() != before || exists("/tmp/pwned") || job_key(1, "state") == "12") {
            ++failures;
            ADD_FAILURE() << PAYLOADS[p].substr(0, 60) << read_file("/tmp/output");
        }
    }
    write_file("/etc/rsyncd.conf", own_config);
    expect_none_of(tries, failures, "hostile module names and paths");
}

TEST_F(Holds, AKillInMidSaveLeavesTheOldTreeOrTheNew)
{
    const int tries = rounds(60, 1000);
    for (int i = 1; i <= 40; ++i)
        add_job({{"job_name", "j" + std::to_string(i)}, {"state", "5"}});
    std::mt19937 random(1);
    int failures = 0;
    int saved = 0;
    store_set("/backup_mgr/rsync/item:1/state", "3");
    store_save();
    const auto begin = std::chrono::steady_clock::now();
    wait_for(start({"-a"}));
    const auto whole =
        std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - begin);
    std::uniform_int_distribution<useconds_t> moment(0, static_cast<useconds_t>(2 * whole.count()));
    for (int i = 0; i < tries; ++i) {
        const std::string state = "/backup_mgr/rsync/item:" + std::to_string(i % 40 + 1) + "/state";
        store_set(state, "3");
        store_save();
        const pid_t child = start({"-a"});
        usleep(moment(random));
        kill(child, SIGKILL);
        wait_for(child);
        // A process of its own: what it reads is what the file holds.
        const int found = in_child([&] {
            rsync_load_jobs();
            const RsyncJob *const job = rsync_find_job("j" + std::to_string(i % 40 + 1));
            return job_list->count == 40 && job != nullptr ? job->state : 0;
        });
        saved += found == JOB_INTERRUPTED ? 1 : 0;
        failures += found == JOB_INTERRUPTED || found == JOB_RUNNING ? 0 : 1;
    }
    EXPECT_GT(saved, 0) << "none of the kills came after a save: too early to mean anything";
    rsync_set_job_state("j1", JOB_DONE);
    EXPECT_EQ(std::distance(fs::directory_iterator("/etc/NAS_CFG"), fs::directory_iterator()), 1)
        << "a left temporary";
    expect_none_of(tries, failures, "SIGKILL in mid-save: the file parses, old or new");
}

TEST_F(Holds, OfManyWritersNothingIsLostAndNoReadIsTorn)
{
    constexpr int WRITERS = 8;
    const int changes = rounds(10, 100);
    for (int i = 1; i <= WRITERS; ++i)
        add_job({{"job_name", "j" + std::to_string(i)}, {"remote_path", std::to_string(i)}});
    std::vector<pid_t> children;
    for (int i = 1; i <= WRITERS; ++i) {
        children.push_back(fork());
        if (children.back() != 0) continue;
        for (int n = 1; n <= changes; ++n)
            rsync_set_job_state("j" + std::to_string(i), static_cast<JobState>(1000 * i + n));
        _exit(0);
    }
    int torn = 0;
    int reads = 0;
    do {
        rsync_load_jobs(); // without the lock, as a run does
        ++reads;
        int found = 0;
        for (const RsyncJob *job = job_list->head; job != nullptr; job = job->next) {
            found += job->job_name == "j" + std::string(job->remote_path) ? 1 : 0;
        }
        torn += found == WRITERS ? 0 : 1;
        rsync_free_jobs();
    } while (waitpid(children.back(), nullptr, WNOHANG) == 0);
    while (wait(nullptr) > 0) {
    }
    int lost = 0;
    for (int i = 1; i <= WRITERS; ++i)
        lost += job_key(i, "state") == std::to_string(1000 * i + changes) ? 0 : 1;
    expect_none_of(WRITERS * changes, lost, "state changes by 8 processes: none lost");
    expect_none_of(reads, torn, "reads beside them: none torn");
}

TEST_F(Holds, OfManyRunsOfAJobOneStarts)
{
    // The one that runs goes on until the others have ended.
    const Fake rsync("/usr/sbin/rsync", "case \"$*\" in *--dry-run*|*::) ;; *) cat /var/run/bakjob_daily.pid "
                                        ">>/tmp/pids; until [ -e /tmp/go ]; do sleep 0.05; done ;; esac\n");
    constexpr int RUNS = 64;
    const int tries = rounds(2, 20);
    int failures = 0;
    add_job({});
    for (int round = 0; round < tries; ++round) {
        shell("rm -f /tmp/pids /tmp/go");
        for (int i = 0; i < RUNS; ++i)
            start({"-r", "daily"});
        int refused = 0;
        int status = 0;
        eventually(
            [&] {
                while (waitpid(-1, &status, WNOHANG) > 0)
                    refused += WEXITSTATUS(status) == 255 ? 1 : 0;
                return refused == RUNS - 1;
            },
            60);
        write_file("/tmp/go", "");
        const pid_t ran = wait(&status);
        const bool one = refused == RUNS - 1 && status == 0 && wait(nullptr) < 0 &&
                         read_file("/tmp/pids") == std::to_string(ran) + "\n" &&
                         !exists("/var/run/bakjob_daily.pid");
        failures += one ? 0 : 1;
    }
    expect_none_of(tries, failures, "64 simultaneous runs of a job: one runs");
}

TEST_F(Holds, AKilledRunIsGone)
{
    // A transfer, here of either kind, that stays: in the process list as the appliance's own, with a child.
    const std::string stay = "exec -a '/usr/sbin/rsync --job-name=daily' bash -c 'sleep 4711 & wait'";
    struct Phase {
        const char *name;
        std::string script;
    };
    const std::vector<Phase> phases = {
        {"probe", "case \"$*\" in *::) touch /tmp/there; sleep 2 ;; esac\n"},
        {"dry run", "case \"$*\" in *--job-name=*--dry-run*) touch /tmp/there; " + stay + " ;; esac\n"},
        {"transfer",
         "case \"$*\" in *--dry-run*) ;; *--job-name=*) touch /tmp/there; " + stay + " ;; esac\n"},
        {"retry wait", "case \"$*\" in *--dry-run*) ;; *--job-name=*) touch /tmp/there; exit 11 ;; esac\n"}};
    const int tries = rounds(2, 20);
    for (const Phase &phase : phases) {
        SetUp();
        add_job({{"retry", "3"}, {"retry_interval", "180"}});
        int failures = 0;
        for (int i = 0; i < tries; ++i) {
            fs::remove("/tmp/there");
            pid_t run = 0;
            {
                Fake rsync("/usr/sbin/rsync", "");
                write_file("/usr/sbin/rsync", "#!/bin/bash\n" + phase.script);
                run = start({"-r", "daily"});
                if (!eventually([] { return exists("/tmp/there"); })) ++failures;
                usleep(20'000);
                wait_for(start({"-k", "daily"}));
            }
            const bool killed = wait_for(run) == 128 + SIGKILL;
            const auto left = [] {
                return shell("ps | grep -e '[j]ob-name=daily' -e '[b]akjob -r daily'").output;
            };
            const bool gone = eventually([&] { return left().empty(); }, 5);
            const bool recorded = job_key(1, "state") == "11" && !exists("/var/run/bakjob_daily.pid");
            wait_for(start({"-r", "daily"}));
            if (!killed || !gone || !recorded || job_key(1, "state") != "2") {
                ++failures;
                ADD_FAILURE() << phase.name << killed << gone << recorded << left();
            }
            shell("pkill -f '[s]leep 4711'");
        }
        expect_none_of(tries, failures,
                       std::string("kill during a ") + phase.name + ": gone, next run works");
    }
}

TEST_F(Holds, WhatSomebodyPlacedIsNeitherReadNorChanged)
{
    const std::vector<std::string> names = {"/tmp/r_daily.passwd",
                                            "/tmp/r_daily",
                                            "/tmp/r_daily.dump_size",
                                            "/tmp/rsync_write_conf.lock",
                                            "/tmp/rsync_bakcup_src_folder_name.daily",
                                            "/tmp/remote_rshareinfo_daily.txt",
                                            "/tmp/remote_rinfo.txt",
                                            "/tmp/rsync_debug",
                                            "/var/run/bakjob_daily.pid",
                                            "/etc/cron.d/device_scheduler"};
    const std::map<std::string, std::string> traps = {{"link", "ln -s /tmp/victim "},
                                                      {"dangling link", "ln -s /tmp/made "},
                                                      {"second name", "ln /tmp/victim "},
                                                      {"pipe", "mkfifo "},
                                                      {"folder", "mkdir "}};
    int tries = 0;
    int failures = 0;
    for (const std::string &name : names) {
        for (const auto &[kind, command] : traps) {
            if (soak_table() == nullptr && (name.size() + kind.size()) % 8 != 0) continue;
            SetUp();
            fs::remove_all("/remote/backup/S1_remote_backup");
            add_job({{"ssh_pwd", "cm9vdHB3"}});
            write_file("/tmp/victim", "kept");
            fs::permissions("/tmp/victim", fs::perms(0644));
            shell("rm -rf " + name + " /tmp/made; " + command + name);
            const pid_t run = fork();
            if (run == 0) {
                // What the program itself does not use: the trace file, the discovery's copy.
                run_options.debug_mode = 2;
                DebugLog("traced\n");
                CurrentJob = make_job("daily");
                CurrentJob.server_type = 1;
                snprintf(CurrentJob.remote_ip, sizeof CurrentJob.remote_ip, "127.0.0.1");
                if (name == "/tmp/remote_rinfo.txt") rsync_discover_remote();
                execl("/usr/sbin/bakjob", "bakjob", "-r", "daily", nullptr);
            }
            const bool ends = eventually([&] { return waitpid(run, nullptr, WNOHANG) != 0; }, 30);
            if (!ends) kill(run, SIGKILL);
            ++tries;
            if (!ends || read_file("/tmp/victim") != "kept" || octal_mode("/tmp/victim") != "644" ||
                exists("/tmp/made")) {
                ++failures;
                ADD_FAILURE() << name << " " << kind;
            }
            shell("rm -rf " + name);
        }
    }
    expect_none_of(tries, failures, "links and files placed at our names: untouched");
}

TEST_F(Holds, NobodyElseCanEverReadThePassword)
{
    add_job({});
    umask(0);
    const pid_t thief = fork();
    if (thief == 0) {
        if (setgid(65534) != 0 || setuid(65534) != 0) _exit(1);
        while (open("/tmp/r_daily.passwd", O_RDONLY) < 0) {
        }
        _exit(2);
    }
    const int tries = rounds(4, 100);
    for (int i = 0; i < tries; ++i)
        wait_for(start({"-r", "daily"}));
    umask(022);
    kill(thief, SIGKILL);
    expect_none_of(tries, wait_for(thief) == 128 + SIGKILL ? 0 : 1,
                   "runs beside a reader of passwords: nothing read");
}

TEST_F(Holds, AMisbehavingRemoteSideIsAFailedFolder)
{
    // The one on 873 takes every address, this one is more special.
    shell("pkill -f '[r]sync --daemon'");
    ASSERT_TRUE(eventually([] { return shell("pgrep -f '[r]sync --daemon'").output.empty(); }));
    struct Case {
        std::string what;
        std::function<void(int)> behave;
        std::string client; // in the place of rsync, which reads a greeting byte by byte
        bool slow;          // only the stand-ins' time-outs end it
    };
    const std::string size = std::to_string(rounds(2'000'000, 100'000'000));
    const std::vector<Case> cases = {
        {"a host that accepts and never answers", [](int) { sleep(600); }, "", true},
        {"a host that drops the connection at once", [](int) {}, "", false},
        {"a host that drops it in mid-reply", [](int c) { (void)!write(c, "@RSYNCD: 31.0 md5\nmod", 21); },
         "", false},
        {"a daemon that prints 100 MB", [](int) {}, "yes | head -c " + size + "; exit 5\n", false},
        {"a daemon that prints a line without end", [](int) {},
         "head -c " + size + " /dev/zero | tr '\\0' x; exit 5\n", false}};
    for (const Case &one : cases) {
        if (one.slow && soak_table() == nullptr) continue;
        const BadServer server(one.behave);
        EXPECT_TRUE(server.bound());
        const Fake rsync("/usr/sbin/rsync",
                         one.client.empty() ? "exec /usr/sbin/rsync.real \"$@\"\n" : one.client);
        SetUp();
        add_job({{"remote_ip", "127.0.0.9"}});
        const pid_t run = start({"-d", "-r", "daily"});
        rusage usage{};
        int status = 0;
        const bool ended =
            eventually([&] { return wait4(run, &status, WNOHANG, &usage) == run; }, one.slow ? 400 : 60);
        if (!ended) kill(run, SIGKILL);
        const bool well = ended && status == 0 && job_key(1, "state") == "4" && alerts().size() == 1 &&
                          usage.ru_maxrss < 64'000;
        EXPECT_TRUE(well) << one.what << " state " << job_key(1, "state") << " kB " << usage.ru_maxrss
                          << read_file("/tmp/output").substr(0, 3000);
        expect_none_of(1, well ? 0 : 1, one.what);
    }
    shell("/usr/bin/rsync --daemon --config=/etc/rsyncd.conf </dev/null >/dev/null 2>&1");
}

TEST_F(Holds, AFullOrMissingDiskIsAFailedFolder)
{
    add_job({});
    write_file(std::string(SHARE) + "/big", std::string(4'000'000, 'x'));
    shell("mount -t tmpfs -o size=1m full /remote/backup && mkdir -p /remote/backup/S1_remote_backup/daily");
    traced({"-r", "daily"});
    shell("umount /remote/backup");
    const bool full = job_key(1, "state") == "4" && alerts().size() == 1;
    expect_none_of(1, full ? 0 : 1, "a full target disk");

    SetUp();
    shell(std::string("mount -t tmpfs share ") + SHARE + " && mkdir " + SHARE + "/a " + SHARE +
          "/b && touch " + SHARE + "/a/x");
    add_job({{"local_path", SHARE + std::string("/a:") + SHARE + "/b"}});
    fs::create_directories("/remote/backup/S1_remote_backup/daily/Public");
    write_file("/remote/backup/S1_remote_backup/daily/Public/b/kept", "x");
    {
        const Fake rsync(
            "/usr/sbin/rsync",
            std::string(
                "/usr/sbin/rsync.real \"$@\"; code=$?\ncase \"$*\" in *--dry-run*|*::) ;; *) umount -l ") +
                SHARE + " ;; esac\nexit $code\n");
        traced({"-r", "daily"});
    }
    shell(std::string("umount -l ") + SHARE + " 2>/dev/null");
    const auto raised = alerts();
    const bool well = raised.size() == 2 && raised[0].starts_with("1 2402") &&
                      raised[1].starts_with("1 1400") &&
                      exists("/remote/backup/S1_remote_backup/daily/Public/b/kept");
    EXPECT_TRUE(well) << read_file("/tmp/output");
    expect_none_of(1, well ? 0 : 1, "a share unmounted in mid-run: nothing deleted remotely");
}
