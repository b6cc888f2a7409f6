#pragma once

// What one command line has set, for the whole process, and a few buffers of the run.

#include <cstdint>

namespace bakjob
{

struct RunOptions {
    std::int32_t restore_mode; // 1: a restore run, whose states go to `rstate`
    char inc_root_path[1024];  // newest snapshot folder of the running job
    std::int32_t recover_seq;  // number given with -n; 0: not a recover run
    char snapshot_prefix[128]; // name that snapshot folders begin with, set by the first listing
    char alert_text[512];      // text of the alert being raised
    std::uint32_t debug_mode;  // 0: no trace, 1: to standard output, other: to TRACE_FILE
};

extern RunOptions run_options;

inline bool is_restore_run()
{
    return run_options.restore_mode != 0;
}

inline bool is_recover_run()
{
    return run_options.recover_seq != 0;
}

} // namespace bakjob
