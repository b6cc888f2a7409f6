#include "soak_support.h"

#include <arpa/inet.h>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sys/socket.h>
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

std::string traced(std::vector<std::string> arguments)
{
    arguments.insert(arguments.begin(), "-d");
    wait_for(start(arguments));
    return read_file("/tmp/output");
}

void Holds::SetUp()
{
    ApplianceWithShare::SetUp();
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

void Chance::pause(std::chrono::microseconds most)
{
    usleep(static_cast<useconds_t>(number(0, static_cast<int>(most.count()))));
}

std::chrono::microseconds time_of_run(const std::vector<std::string> &arguments)
{
    const auto begin = std::chrono::steady_clock::now();
    wait_for(start(arguments));
    return std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - begin);
}

BadServer::BadServer(const std::function<void(int)> &behave, std::uint16_t port)
{
    const int listening = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const int on = 1;
    setsockopt(listening, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    inet_pton(AF_INET, "127.0.0.9", &address.sin_addr);
    bound_ = bind(listening, reinterpret_cast<sockaddr *>(&address), sizeof address) == 0 &&
             listen(listening, 8) == 0;
    server_ = fork();
    if (server_ == 0) {
        std::signal(SIGPIPE, SIG_IGN);
        std::signal(SIGCHLD, SIG_IGN);
        for (;;) {
            const int connection = accept(listening, nullptr, nullptr);
            if (fork() == 0) {
                close(listening);
                behave(connection);
                _exit(0);
            }
            close(connection);
        }
    }
    close(listening);
}

BadServer::~BadServer()
{
    kill(server_, SIGKILL);
    waitpid(server_, nullptr, 0);
}
