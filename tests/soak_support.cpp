#include "soak_support.h"

#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <sys/wait.h>
#include <unistd.h>

namespace fs = std::filesystem;

const char *soak_table()
{
    return std::getenv("BAKJOB_SOAK");
}

int rounds(int here, int soaking)
{
    return soak_table() == nullptr ? here : soaking;
}

pid_t start(const std::vector<std::string> &arguments)
{
    const pid_t child = fork();
    if (child != 0) return child;
    const int output = open("/tmp/output", O_WRONLY | O_CREAT | O_TRUNC, 0600);
    dup2(output, STDOUT_FILENO);
    dup2(output, STDERR_FILENO);
    std::vector<char *> argv{const_cast<char *>("bakjob")};
    for (const std::string &argument : arguments)
        argv.push_back(const_cast<char *>(argument.c_str()));
    argv.push_back(nullptr);
    execv("/usr/sbin/bakjob", argv.data());
    _exit(127);
}

int wait_for(pid_t child)
{
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

std::string traced(std::vector<std::string> arguments)
{
    arguments.insert(arguments.begin(), "-d");
    wait_for(start(arguments));
    return read_file("/tmp/output");
}

void Holds::SetUp()
{
    Appliance::SetUp();
    add_share("Public", SHARE);
    write_file(std::string(SHARE) + "/file", "x");
    write_file("/tmp/kv_serial.txt", "S1");
    shell("mkdir -p ~root/.ssh"); // as a first ssh login would
    fs::create_directories("/remote/backup/S1_remote_backup/daily");
    fs::create_directories("/remote/data/S1_remote_backup/daily");
}

void Holds::expect_none_of(int tries, int failures, const std::string &what)
{
    EXPECT_EQ(failures, 0) << what;
    if (soak_table() != nullptr)
        std::ofstream(soak_table(), std::ios::app) << what << '\t' << tries << '\t' << failures << '\n';
}
