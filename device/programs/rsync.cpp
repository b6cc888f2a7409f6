// rsync: the stock program, with what the appliance's own adds to it.
//
//   --job-name=NAME   the job that a transfer belongs to; it stays visible in the process list
//   --dump-size       taken and ignored
//
// It never asks a question, and gives up on a far end that stays silent.

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>
#include <unistd.h>
#include <vector>

namespace
{

constexpr const char *STOCK_RSYNC = "/usr/bin/rsync";
constexpr const char *OWN_NAME = "/usr/sbin/rsync";
constexpr const char *REMOTE_SHELL = "/usr/sbin/ssh";
constexpr std::string_view JOB_NAME = "--job-name=";

// So that a far end which takes a connection and then says nothing does not hold a job for ever.
std::string connect_limit = "--contimeout=30";
std::string silence_limit = "--timeout=60";

enum class Place { HERE, BEHIND_SHELL, DAEMON };

// [USER@]HOST:PATH, [USER@]HOST::MODULE or rsync://..., where HOST may be an IPv6 address in brackets.
Place place_of(std::string_view argument)
{
    if (argument.starts_with('-')) return Place::HERE;
    if (argument.starts_with("rsync://")) return Place::DAEMON;
    const std::size_t host = argument.find('[');
    const bool bracketed =
        host == 0 || (host != std::string_view::npos && host > 0 && argument[host - 1] == '@');
    const std::size_t bracket = bracketed ? argument.find(']') : std::string_view::npos;
    const std::size_t colon = argument.find(':', bracket == std::string_view::npos ? 0 : bracket);
    if (colon == std::string_view::npos || argument.find('/') < colon) return Place::HERE;
    return argument.substr(colon).starts_with("::") ? Place::DAEMON : Place::BEHIND_SHELL;
}

bool has_option(const std::vector<char *> &arguments, std::string_view start)
{
    return std::any_of(arguments.begin(), arguments.end(),
                       [&](const char *argument) { return std::string_view(argument).starts_with(start); });
}

// Stock rsync refuses a connect limit where it makes no connection of its own. How long a job's transfer may
// be silent is the job's to say.
void add_limits(std::vector<char *> &arguments, bool of_job)
{
    bool daemon = false;
    bool remote = false;
    for (const char *argument : arguments) {
        const Place place = place_of(argument);
        daemon = daemon || place == Place::DAEMON;
        remote = remote || place != Place::HERE;
    }
    const bool own_shell = has_option(arguments, "-e") || has_option(arguments, "--rsh");
    if (remote && !of_job && !has_option(arguments, "--timeout"))
        arguments.insert(arguments.begin(), silence_limit.data());
    if (daemon && !own_shell && !has_option(arguments, "--contimeout")) {
        arguments.insert(arguments.begin(), connect_limit.data());
    }
}

int run_stock(std::vector<char *> &arguments)
{
    arguments.push_back(nullptr);
    execv(STOCK_RSYNC, arguments.data());
    std::fprintf(stderr, "rsync: cannot run %s: %s\n", STOCK_RSYNC, std::strerror(errno));
    return EXIT_FAILURE;
}

} // namespace

int main(int argc, char **argv)
{
    std::vector<char *> arguments(argv + 1, argv + argc);
    std::string name = OWN_NAME;
    const bool serves = !arguments.empty() && std::strcmp(arguments.front(), "--server") == 0;
    if (!serves) {
        const auto is_own = [&](const char *argument) {
            const std::string_view text = argument;
            if (text.starts_with(JOB_NAME)) name = std::string(OWN_NAME) + ' ' + argument;
            return text.starts_with(JOB_NAME) || text == "--dump-size";
        };
        arguments.erase(std::remove_if(arguments.begin(), arguments.end(), is_own), arguments.end());
        add_limits(arguments, name != OWN_NAME);
        setenv("RSYNC_RSH", REMOTE_SHELL, 1);
        setenv("RSYNC_PASSWORD", "", 0);
    }
    arguments.insert(arguments.begin(), name.data());
    return run_stock(arguments);
}
