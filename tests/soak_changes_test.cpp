// Changes of the job list by many at once, by somebody who is killed in the middle, beside a neighbour who
// does what he can against the lock: the file is old or new, and none is lost.

#include "common/job_files.h"
#include "config/job_list.h"
#include "config/job_state.h"
#include "config/job_store.h"
#include "soak_support.h"

#include <csignal>
#include <filesystem>
#include <set>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

std::string job_number(int number)
{
    return "j" + std::to_string(number);
}

// A folder, a link, a file and nothing in turn, as quickly as it goes.
void plant_for_ever()
{
    become_neighbour();
    for (;;) {
        mkdir(CONFIG_LOCK_FILE, 0777);
        rmdir(CONFIG_LOCK_FILE);
        if (symlink("/tmp/kv_serial.txt", CONFIG_LOCK_FILE) == 0) unlink(CONFIG_LOCK_FILE);
        if (mknod(CONFIG_LOCK_FILE, S_IFREG | 0666U, 0) == 0) unlink(CONFIG_LOCK_FILE);
    }
}

void plant_folders_for_ever()
{
    become_neighbour();
    for (;;)
        mkdir(CONFIG_LOCK_FILE, 0777);
}

// As a neighbour can where the kernel lets him link what he cannot open.
void link_for_ever()
{
    for (unsigned i = 0;; i = (i + 1) % 16) {
        const std::string other = "/tmp/other" + std::to_string(i);
        unlink(other.c_str());
        (void)!link(CONFIG_LOCK_FILE, other.c_str());
    }
}

void plant_a_folder()
{
    become_neighbour();
    mkdir(CONFIG_LOCK_FILE, 0777);
}

struct Neighbour {
    const char *what;
    void (*act)();
};

constexpr Neighbour NEIGHBOURS[] = {{"a folder in the lock's place", plant_a_folder},
                                    {"folders put there again and again", plant_folders_for_ever},
                                    {"this and that put there and taken away", plant_for_ever},
                                    {"other names given to the lock", link_for_ever}};

pid_t start_neighbour(const Neighbour &neighbour)
{
    const pid_t rival = fork();
    if (rival == 0) {
        neighbour.act();
        _exit(0);
    }
    if (neighbour.act == plant_a_folder) waitid(P_PID, static_cast<id_t>(rival), nullptr, WEXITED | WNOWAIT);
    return rival;
}

pid_t add_in_background(int number)
{
    const pid_t child = fork();
    if (child != 0) return child;
    execl("/usr/sbin/bakjobctl", "bakjobctl", "add", job_number(number).c_str(), "remote_ip=127.0.0.1",
          "remote_path=backup", ("local_path=" + SHARE).c_str(), nullptr);
    _exit(127);
}

} // namespace

TEST_F(Holds, AKillInMidSaveLeavesTheOldTreeOrTheNew)
{
    constexpr int JOBS = 40;
    for (int i = 1; i <= JOBS; ++i)
        add_job({{"job_name", job_number(i)}, {"state", "5"}});
    const auto claim_a_run = [](int number) {
        store_set("/backup_mgr/rsync/item:" + std::to_string(number) + "/state", "3");
        store_save();
    };
    claim_a_run(1);
    const auto whole = time_of_run({"-a"});
    Chance chance(1);
    const int tries = rounds(60, 1000);
    int failures = 0;
    int saved = 0;
    for (int i = 0; i < tries; ++i) {
        const int number = i % JOBS + 1;
        claim_a_run(number);
        const pid_t child = start({"-a"});
        chance.pause(2 * whole);
        kill(child, SIGKILL);
        wait_for(child);
        // A process of its own: what it reads is what the file holds.
        const int found = in_child([&] {
            rsync_load_jobs();
            const RsyncJob *const job = rsync_find_job(job_number(number));
            return job_list->count == JOBS && job != nullptr ? job->state : 0;
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
        add_job({{"job_name", job_number(i)}, {"remote_path", std::to_string(i)}});
    pid_t last = 0;
    for (int i = 1; i <= WRITERS; ++i) {
        last = fork();
        if (last != 0) continue;
        for (int n = 1; n <= changes; ++n)
            rsync_set_job_state(job_number(i), static_cast<JobState>(1000 * i + n));
        _exit(0);
    }
    int torn = 0;
    int reads = 0;
    do {
        rsync_load_jobs(); // without the lock, as a run does
        ++reads;
        int found = 0;
        for (const RsyncJob *job = job_list->head; job != nullptr; job = job->next)
            found += job->job_name == "j" + std::string(job->remote_path) ? 1 : 0;
        torn += found == WRITERS ? 0 : 1;
        rsync_free_jobs();
    } while (waitpid(last, nullptr, WNOHANG) == 0);
    while (wait(nullptr) > 0) {
    }
    int lost = 0;
    for (int i = 1; i <= WRITERS; ++i)
        lost += job_key(i, "state") == std::to_string(1000 * i + changes) ? 0 : 1;
    expect_none_of(WRITERS * changes, lost, "state changes by 8 processes: none lost");
    expect_none_of(reads, torn, "reads beside them: none torn");
}

TEST_F(Holds, NoChangeIsLostToANeighbour)
{
    constexpr int CHANGES = 80;
    for (const Neighbour &neighbour : NEIGHBOURS) {
        const int tries = rounds(1, 25);
        int failures = 0;
        for (int i = 0; i < tries; ++i) {
            SetUp();
            const pid_t rival = start_neighbour(neighbour);
            std::vector<pid_t> adding;
            for (int number = 0; number < CHANGES; ++number)
                adding.push_back(add_in_background(number));
            int refused = 0;
            for (const pid_t one : adding)
                refused += wait_for(one) == 0 ? 0 : 1;
            kill(rival, SIGKILL);
            wait_for(rival);
            const auto names = lines_of(shell("bakjobctl list --names").output);
            const std::size_t kept = std::set<std::string>(names.begin(), names.end()).size();
            if (refused == 0 && kept == CHANGES) continue;
            ++failures;
            ADD_FAILURE() << neighbour.what << ": " << refused << " refused, " << kept << " kept";
        }
        expect_none_of(tries, failures, std::string("80 changes at once, ") + neighbour.what);
    }
}
