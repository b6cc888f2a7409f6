// bakjobctl: backup jobs for people. The words of the command line, and which function they mean.

#include "check/commands.h"
#include "common/process_start.h"
#include "config/config_lock.h"
#include "jobs/commands.h"
#include "output/failure.h"
#include "recover/commands.h"
#include "runs/commands.h"

#include <CLI/CLI.hpp>
#include <array>
#include <csignal>
#include <cstdio>
#include <exception>
#include <string>
#include <string_view>
#include <unistd.h>

using namespace bakjob::ctl;

namespace
{

struct Command {
    const char *name;
    const char *what;
    int (*act)(const Request &request);
    std::string_view takes; // n: a job's name, N: perhaps one, s: settings, t: times, j, l, p: flags
};

constexpr std::array COMMANDS = {
    Command{"list", "Lists the jobs", list_jobs, "jl"},
    Command{"show", "Shows a job with all its keys", show_job, "nj"},
    Command{"status", "Tells how the last runs ended, also by the exit status", show_status, "Nj"},
    Command{"keys", "Lists the keys that add and set take", show_keys, "jl"},
    Command{"add", "Adds a job", add_job, "ns"},
    Command{"set", "Changes keys of a job", set_job, "ns"},
    Command{"delete", "Deletes a job; what it backed up stays", delete_job, "n"},
    Command{"enable", "Lets a job run", enable_job, "n"},
    Command{"disable", "Refuses a job's runs", disable_job, "n"},
    Command{"schedule", "Gives a job its one timetable, in cron's notation", schedule_job, "nt"},
    Command{"unschedule", "Takes a job's timetable away", unschedule_job, "n"},
    Command{"check", "Finds what would make a run fail", check_job, "njp"},
    Command{"watch", "Follows a run to its end", watch_job, "nj"},
    Command{"snapshots", "Lists a job's snapshots and how to recover them", show_snapshots, "nj"},
    Command{"remote", "Lists what the remote side offers, and sizes on both sides", show_remote, "nj"},
};

void add_command(CLI::App &app, const Command &command, Request &request)
{
    CLI::App *const sub = app.add_subcommand(command.name, command.what);
    for (const char taken : command.takes) {
        switch (taken) {
        case 'n':
            sub->add_option("NAME", request.name, "The job's name")->required();
            break;
        case 'N':
            sub->add_option("NAME", request.name, "The job's name; without it, all jobs");
            break;
        case 's':
            sub->add_option("KEY=VALUE", request.settings, "See the command keys")->allow_extra_args();
            break;
        case 't':
            sub->add_option("TIMES", request.times, "\"MINUTE HOUR DAY MONTH WEEKDAY\"")->required();
            break;
        case 'j':
            sub->add_flag("--json", request.json, "For programs");
            break;
        case 'l':
            sub->add_flag("--names", request.names, "Only the names, one a line");
            break;
        default:
            sub->add_flag("--probe", request.probe, "Ask the remote side, too");
        }
    }
}

int act(const CLI::App &app, Request &request)
{
    if (geteuid() != 0) throw Failure("root is needed");
    for (const Command &command : COMMANDS) {
        if (!app.got_subcommand(command.name)) continue;
        const CLI::Option *const name = app.get_subcommand(command.name)->get_option_no_throw("NAME");
        request.named = name != nullptr && name->count() > 0;
        return command.act(request);
    }
    throw Failure("no such command");
}

int run(int argc, char **argv)
{
    CLI::App app("Manages backup jobs. bakjob runs them.", "bakjobctl");
    app.set_version_flag("--version", "bakjobctl " BAKJOB_VERSION);
    app.require_subcommand(1);
    Request request;
    for (const Command &command : COMMANDS) {
        add_command(app, command, request);
    }
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError &end) {
        return app.exit(end) == 0 ? EXIT_FINE : EXIT_REFUSED;
    }
    return act(app, request);
}

void tell_of_wait(const char *path, const std::optional<bakjob::LockHolder> &holder)
{
    std::string who = "another process";
    if (holder) who = "process " + std::to_string(holder->process);
    if (holder && !holder->program.empty()) who += " (" + holder->program + ')';
    std::fprintf(stderr, "bakjobctl: waiting for %s, which %s holds\n", path, who.c_str());
}

} // namespace

int main(int argc, char **argv)
{
    bakjob::rsync_prepare_process();
    bakjob::rsync_tell_lock_waits(tell_of_wait);
    std::signal(SIGXFSZ, SIG_IGN); // a file that may not grow is a failed write
    try {
        const int status = run(argc, argv);
        if (std::fflush(stdout) == 0 && std::ferror(stdout) == 0) return status;
        std::perror("bakjobctl: standard output");
        return EXIT_REFUSED;
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "bakjobctl: %s\n", failure.what());
        return EXIT_REFUSED;
    }
}
