// ssh: the stock client, with the login password as an option, "-d BASE64". It never asks a question: a new
// host's key is taken and kept, a changed one refused, and without -d there is no password. A probe may not
// take long in all (stock_program.h).
//
// The stock client gets the password from a helper that it starts, which is this program again. It is told
// so, and given the base64 text, by an environment variable.

#include "stock_program.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <netinet/in.h>
#include <optional>
#include <resolv.h>
#include <spawn.h>
#include <string>
#include <string_view>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace
{

constexpr int FAILED = 255; // as the stock client ends
constexpr StockProgram STOCK_SSH = {"ssh", "/usr/bin/ssh", FAILED, FAILED};
constexpr const char *PASSWORD_VARIABLE = "DEVICE_SSH_PASSWORD";
constexpr const char *STOCK_OPTIONS =
    "+1246ab:c:e:fgi:kl:m:no:p:qstvxAB:CD:E:F:GI:J:KL:MNO:PQ:R:S:TVw:W:XYyd:";

// They come behind the caller's own: the stock client takes the first value that it is given. Nothing below
// an error is printed, or the news of a learnt host key would hide the reply.
constexpr std::array ALWAYS = {"StrictHostKeyChecking=accept-new",
                               "UpdateHostKeys=no",
                               "LogLevel=ERROR",
                               "ConnectTimeout=30",
                               "ServerAliveInterval=15",
                               "ServerAliveCountMax=4",
                               "NumberOfPasswordPrompts=1"};

std::optional<std::string> decode(const char *base64)
{
    std::string text(std::strlen(base64) + 1, '\0');
    const int length = b64_pton(base64, reinterpret_cast<unsigned char *>(text.data()), text.size());
    if (length < 0) return std::nullopt;
    text.resize(static_cast<std::size_t>(length));
    if (text.find('\0') != std::string::npos || text.find('\n') != std::string::npos) return std::nullopt;
    return text;
}

// The stock client asks other questions this way too, such as for the passphrase of a key.
int answer(std::string_view question, const char *base64)
{
    const auto password = decode(base64);
    if (!password || question.find("assword") == std::string_view::npos) return EXIT_FAILURE;
    return std::puts(password->c_str()) < 0 ? EXIT_FAILURE : EXIT_SUCCESS;
}

// What "ssh -Q cipher" prints; empty when it cannot be asked.
std::string known_ciphers()
{
    std::array<int, 2> ends{};
    if (pipe(ends.data()) < 0) return {};
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, ends[1], STDOUT_FILENO);
    posix_spawn_file_actions_addclose(&actions, ends[0]);
    std::array<std::string, 3> words = {STOCK_SSH.path, "-Q", "cipher"};
    std::array<char *, 4> arguments = {words[0].data(), words[1].data(), words[2].data(), nullptr};
    pid_t child = 0;
    const bool started =
        posix_spawn(&child, STOCK_SSH.path, &actions, nullptr, arguments.data(), environ) == 0;
    posix_spawn_file_actions_destroy(&actions);
    close(ends[1]);
    std::string output;
    std::array<char, 1024> piece{};
    for (ssize_t count = 0; (count = read(ends[0], piece.data(), piece.size())) > 0;) {
        output.append(piece.data(), static_cast<std::size_t>(count));
    }
    close(ends[0]);
    if (started) waitpid(child, nullptr, 0);
    return output;
}

// Those of a list of ciphers, separated by commas, that the stock client knows.
std::string usable_ciphers(std::string_view list)
{
    const std::string known = '\n' + known_ciphers();
    std::string usable;
    while (!list.empty()) {
        const std::size_t length = std::min(list.find(','), list.size());
        const std::string name(list.substr(0, length));
        if (!name.empty() && known.find('\n' + name + '\n') != std::string::npos) {
            usable += (usable.empty() ? "" : ",") + name;
        }
        list.remove_prefix(std::min(length + 1, list.size()));
    }
    return usable;
}

struct Call {
    std::vector<std::string> arguments = {STOCK_SSH.path};
    std::optional<std::string> password; // in base64
    bool valid = true;
};

void take_option(Call &call, int letter, char *value)
{
    if (letter == 'd') {
        call.valid = call.valid && decode(value);
        if (!call.valid) std::fputs("ssh: the password after -d is not base64 text\n", stderr);
        call.password = value;
        std::fill_n(value, std::strlen(value), 'x'); // this process may stay in the process list
        return;
    }
    std::string text = value ? value : "";
    if (letter == 'c') text = usable_ciphers(text);
    if (letter == 'c' && text.empty()) return;
    call.arguments.push_back({'-', static_cast<char>(letter)});
    if (value) call.arguments.push_back(text);
}

Call read_call(int argc, char **argv)
{
    Call call;
    int letter = 0;
    while (call.valid && (letter = getopt(argc, argv, STOCK_OPTIONS)) != -1) {
        if (letter == '?') {
            call.valid = false;
        } else {
            take_option(call, letter, optarg);
        }
    }
    for (const char *option : ALWAYS) {
        call.arguments.insert(call.arguments.end(), {"-o", option});
    }
    if (!call.password) call.arguments.insert(call.arguments.end(), {"-o", "BatchMode=yes"});
    if (optind > 1 && std::strcmp(argv[optind - 1], "--") == 0) call.arguments.emplace_back("--");
    call.arguments.insert(call.arguments.end(), argv + optind, argv + argc);
    return call;
}

// Adding up the sizes of a large folder may take hours.
bool asks_for_sizes(int argc, char **argv)
{
    const std::string_view command = optind + 1 < argc ? argv[optind + 1] : "";
    return command == "du" || command == "/usr/bin/du";
}

bool offer_password(const std::string &base64)
{
    std::array<char, PATH_MAX> self{};
    if (readlink("/proc/self/exe", self.data(), self.size() - 1) <= 0) return false;
    return setenv(PASSWORD_VARIABLE, base64.c_str(), 1) == 0 && setenv("SSH_ASKPASS", self.data(), 1) == 0 &&
           setenv("SSH_ASKPASS_REQUIRE", "force", 1) == 0;
}

} // namespace

int main(int argc, char **argv)
{
    const char *const offered = std::getenv(PASSWORD_VARIABLE);
    if (offered && argc == 2) return answer(argv[1], offered);

    Call call = read_call(argc, argv);
    if (!call.valid) return FAILED;
    if (call.password && !offer_password(*call.password)) {
        std::fprintf(stderr, "ssh: cannot hand over the password: %s\n", std::strerror(errno));
        return FAILED;
    }
    if (asks_for_sizes(argc, argv)) return become_stock(STOCK_SSH, call.arguments);
    return run_stock(STOCK_SSH, call.arguments);
}
