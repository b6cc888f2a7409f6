// rsync: the stock program, with what the appliance's own adds to it.
//
//   --job-name=NAME   the job that a transfer belongs to; it stays visible in the process list
//   --dump-size       publish how far the job's transfer is (transfer_figures.h); with --dry-run, try its
//                     start alone (start_check.h)
//
// It never asks a question, and gives up on a far end that stays silent. What moves no job's data may not
// take long in all, even if the far end keeps talking (stock_program.h), and so a dry run that is a probe
// goes into no folder either.

#include "start_check.h"
#include "stock_program.h"
#include "transfer_figures.h"

#include <algorithm>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

namespace
{

using Arguments = std::vector<std::string>;

constexpr StockProgram STOCK_RSYNC = {"rsync", "/usr/bin/rsync", EXIT_FAILURE, 30};
constexpr const char *OWN_NAME = "/usr/sbin/rsync";
constexpr const char *REMOTE_SHELL = "/usr/sbin/ssh";
constexpr std::string_view JOB_NAME = "--job-name=";

// So that a far end which takes a connection and then says nothing does not hold a job for ever.
constexpr const char *CONNECT_LIMIT = "--contimeout=30";
constexpr const char *SILENCE_LIMIT = "--timeout=60";

// A small command is a few words to and fro; held back, most of them wait 40 ms.
constexpr const char *AT_ONCE = "--sockopts=TCP_NODELAY";

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

bool has_option(const Arguments &arguments, std::string_view start)
{
    return std::any_of(arguments.begin(), arguments.end(),
                       [&](const std::string &argument) { return argument.starts_with(start); });
}

// Stock rsync refuses a connect limit where it makes no connection of its own. How long a job's transfer may
// be silent is the job's to say.
void add_connection_options(Arguments &arguments, bool moves_data, bool of_job_module)
{
    bool daemon = false;
    bool remote = false;
    for (const std::string &argument : arguments) {
        const Place place = place_of(argument);
        daemon = daemon || place == Place::DAEMON;
        remote = remote || place != Place::HERE;
    }
    const bool own_shell = has_option(arguments, "-e") || has_option(arguments, "--rsh");
    if (remote && !moves_data && !has_option(arguments, "--timeout"))
        arguments.insert(arguments.begin(), SILENCE_LIMIT);
    if (!daemon || own_shell) return;
    if (!has_option(arguments, "--contimeout")) arguments.insert(arguments.begin(), CONNECT_LIMIT);
    if (of_job_module && !has_option(arguments, "--sockopts")) arguments.insert(arguments.begin(), AT_ONCE);
}

// Takes the option out of the arguments; the last one of those that begin so, empty when there is none.
std::string take_option(Arguments &arguments, std::string_view start)
{
    std::string taken;
    std::erase_if(arguments, [&](const std::string &argument) {
        const bool found = argument.starts_with(start);
        if (found) taken = argument;
        return found;
    });
    return taken;
}

// A name that could lead out of the folder of the figures has none.
bool has_figures(const std::string &job_name)
{
    return !job_name.empty() && job_name.find('/') == std::string::npos;
}

} // namespace

int main(int argc, char **argv)
{
    Arguments arguments(argv + 1, argv + argc);
    if (!arguments.empty() && arguments.front() == "--server") {
        arguments.insert(arguments.begin(), OWN_NAME);
        return become_stock(STOCK_RSYNC, arguments);
    }
    const std::string job = take_option(arguments, JOB_NAME);
    const bool dump_size = !take_option(arguments, "--dump-size").empty();
    const bool start_only = has_option(arguments, "--dry-run") && (dump_size || (job.empty() && is_probe()));
    const bool moves_data = !job.empty() && !start_only;
    add_connection_options(arguments, moves_data, !job.empty() || is_probe());
    setenv("RSYNC_RSH", REMOTE_SHELL, 1);
    setenv("RSYNC_PASSWORD", "", 0);
    arguments.insert(arguments.begin(), job.empty() ? OWN_NAME : OWN_NAME + (' ' + job));
    const std::string job_name = job.substr(std::min(JOB_NAME.size(), job.size()));
    if (moves_data || has_option(arguments, "--daemon")) mark_transfer();
    if (start_only) arguments = start_check(arguments);
    if (dump_size && has_figures(job_name)) {
        if (!start_only) return run_with_figures(STOCK_RSYNC, job_name, arguments);
        forget_total(job_name);
    }
    return run_stock(STOCK_RSYNC, arguments);
}
