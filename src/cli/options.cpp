#include "cli/options.h"

#include "cli/run_job.h"
#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/password.h"
#include "common/run_options.h"
#include "config/job_state.h"

#include <array>
#include <cstdio>
#include <cstdlib>
#include <getopt.h>
#include <optional>
#include <string>

namespace bakjob
{

namespace
{

constexpr int REFUSED = 255;

// What the options of one command line share.
struct OptionLoop {
    std::string job_name; // of the last -r or -k that named one
    bool force = false;
    bool outcome = true; // of every folder of every -r so far
    char password[PASSWORD_SIZE] = "";
    char decoded[PASSWORD_SIZE] = "";
};

// An exit status ends the command line; nullopt: on with the next option.
using Ending = std::optional<int>;

Ending reset_stale_states(OptionLoop & /*loop*/, const char * /*argument*/)
{
    rsync_reset_stale_states();
    return 0;
}

Ending force_run(OptionLoop &loop, const char * /*argument*/)
{
    loop.force = true;
    return std::nullopt;
}

Ending open_trace(OptionLoop & /*loop*/, const char * /*argument*/)
{
    std::puts("OPEN DEBUG MODE!!");
    run_options.debug_mode = 1;
    return std::nullopt;
}

Ending help(OptionLoop & /*loop*/, const char * /*argument*/)
{
    print_usage();
    return 0;
}

Ending restore(OptionLoop & /*loop*/, const char * /*argument*/)
{
    run_options.restore_mode = 1;
    return std::nullopt;
}

Ending recover(OptionLoop & /*loop*/, const char *argument)
{
    const long long seq = std::strtoll(argument, nullptr, 10);
    if (seq == 0 || seq > MAX_SNAPSHOTS || seq < INT32_MIN) {
        DebugLog("ERROR: input error!\n");
        return REFUSED;
    }
    run_options.recover_seq = static_cast<std::int32_t>(seq);
    return std::nullopt;
}

Ending show_password(OptionLoop &loop, const char *argument)
{
    std::snprintf(loop.password, sizeof loop.password, "%s", argument);
    password_decode(loop.decoded, loop.password, sizeof loop.decoded);
    DebugLog("encode_pwd = [%s]\n", loop.decoded);
    return std::nullopt;
}

Ending run(OptionLoop &loop, const char *argument)
{
    if (*argument != '\0') loop.job_name = argument;
    if (rsync_run_job(loop.job_name, loop.force, loop.outcome)) return std::nullopt;
    return REFUSED;
}

Ending kill(OptionLoop &loop, const char *argument)
{
    if (*argument != '\0') loop.job_name = argument;
    rsync_kill_job(loop.job_name);
    return std::nullopt;
}

struct Option {
    char letter;
    Ending (*act)(OptionLoop &loop, const char *argument);
};

constexpr const char *LETTERS = "ahdbi:n:r:p:k:";

constexpr std::array OPTIONS = {
    Option{'a', reset_stale_states},
    Option{'h', help},
    Option{'d', open_trace},
    Option{'b', force_run},
    Option{'i', restore},
    Option{'n', recover},
    Option{'r', run},
    Option{'p', show_password},
    Option{'k', kill},
};

Ending act_on(int letter, OptionLoop &loop)
{
    for (const Option &option : OPTIONS) {
        if (option.letter == letter) return option.act(loop, optarg);
    }
    print_usage();
    return REFUSED;
}

} // namespace

void print_usage()
{
    // A fixed text that others read; bakjob's own version is in CMakeLists.txt.
    std::printf("\nNAME\n\tbakjob - Run Rsync Backup\t[%s]\n\n", "v1.00_20130904");
    for (const char *line : {
             "SYNOPSIS\n\tbakjob [-h] [-n seq] [-r job_name]\n",
             "DESCRIPTION\n\t-h\thelp",
             "\t-b\tforce to run rsync backup (ignore state)",
             "\t-n\tinput backup seq, and run rsync backup recover to remote",
             "\t-r\tinput job name, and run rsync backup according to xml setting",
             "\t-k\tinput job name, and kill rsync backup job",
         }) {
        std::puts(line);
    }
}

int rsync_command_line(int argc, char **argv)
{
    run_options = {};
    opterr = 0;
    OptionLoop loop;
    for (int letter = getopt(argc, argv, LETTERS); letter != -1; letter = getopt(argc, argv, LETTERS)) {
        if (const Ending ending = act_on(letter, loop)) return *ending;
    }
    return 0;
}

} // namespace bakjob
