// Many changes of the job list at once while a neighbour does what he can against its lock: none is lost.

#include "common/job_files.h"
#include "soak_support.h"

#include <algorithm>
#include <array>
#include <csignal>
#include <set>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace bakjob;

namespace
{

constexpr int CHANGES = 80;

void become_neighbour()
{
    if (setgid(65534) != 0 || setuid(65534) != 0) _exit(1);
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

pid_t add_in_background(int number)
{
    const pid_t child = fork();
    if (child != 0) return child;
    const std::string name = "job" + std::to_string(number);
    execl("/usr/sbin/bakjobctl", "bakjobctl", "add", name.c_str(), "remote_ip=127.0.0.1",
          "remote_path=backup", "local_path=/mnt/HD/HD_a2/Public", nullptr);
    _exit(127);
}

} // namespace

TEST_F(Holds, NoChangeIsLostToANeighbour)
{
    for (const Neighbour &neighbour : NEIGHBOURS) {
        const int tries = rounds(1, 25);
        int failures = 0;
        for (int i = 0; i < tries; ++i) {
            SetUp();
            const pid_t rival = fork();
            if (rival == 0) {
                neighbour.act();
                _exit(0);
            }
            if (neighbour.act == plant_a_folder) wait_for(rival);
            std::array<pid_t, CHANGES> adding{};
            std::generate(adding.begin(), adding.end(),
                          [number = 0]() mutable { return add_in_background(number++); });
            int refused = 0;
            for (const pid_t one : adding)
                refused += wait_for(one) == 0 ? 0 : 1;
            if (neighbour.act != plant_a_folder) {
                kill(rival, SIGKILL);
                wait_for(rival);
            }
            const auto names = lines_of(shell("bakjobctl list --names").output);
            const std::size_t kept = std::set<std::string>(names.begin(), names.end()).size();
            if (refused != 0 || kept != CHANGES) {
                ++failures;
                ADD_FAILURE() << neighbour.what << ": " << refused << " refused, " << kept << " kept";
            }
        }
        expect_none_of(tries, failures, std::string("80 changes at once, ") + neighbour.what);
    }
}
