// A run for which memory runs out, at one allocation after another. Not with the sanitizers, which have
// allocations of their own.

#ifndef __SANITIZE_ADDRESS__

#include "cli/run_job.h"
#include "process_support.h"

#include <cstdlib>
#include <new>

namespace
{

int allocations_left = -1; // until one fails; below 0: none does

} // namespace

[[gnu::noinline]] void *operator new(std::size_t size)
{
    if (allocations_left >= 0 && --allocations_left < 0) throw std::bad_alloc();
    void *const memory = std::malloc(size == 0 ? 1 : size);
    if (memory == nullptr) throw std::bad_alloc();
    return memory;
}

[[gnu::noinline]] void operator delete(void *memory) noexcept
{
    std::free(memory);
}

[[gnu::noinline]] void operator delete(void *memory, std::size_t) noexcept
{
    std::free(memory);
}

TEST_F(Holds, ALackOfMemoryEndsARunInOrder)
{
    const JobToHoldUp job;
    const Fake rsync(RSYNC, "");
    enum Ending { DONE = 3, NOT_SHORT, REFUSED, FAILED };
    const auto run = [](int allocations) {
        return in_child([&] {
            bool outcome = true;
            allocations_left = allocations;
            try {
                if (!bakjob::rsync_run_job("daily", false, outcome)) return REFUSED;
                return allocations_left >= 0 ? NOT_SHORT : DONE;
            } catch (const std::bad_alloc &) {
                return FAILED;
            }
        });
    };
    int tries = 0;
    int failures = 0;
    int broken_off = 0;
    for (int allocations = 0;; allocations += rounds(5, 1)) {
        store_set("/backup_mgr/rsync/item:1/state", "0");
        store_save();
        const int ending = run(allocations);
        ++tries;
        const std::string state = job_key(1, "state");
        const bool kept = exists("/var/run/bakjob_daily.unrecorded");
        broken_off += state == "8" || kept ? 1 : 0;
        const bool ended =
            ending == FAILED ? state == "8" || state == "0" || kept : ending != REFUSED || state == "0";
        if (!ended || exists(PID_FILE) || job_key(1, "job_name") != "daily") {
            ++failures;
            ADD_FAILURE() << allocations << " " << ending << " state " << state;
        }
        shell("rm -f /var/run/bakjob_daily.*");
        if (ending == NOT_SHORT) break;
    }
    EXPECT_GT(broken_off, 10);
    expect_none_of(tries, failures, "out of memory at any allocation: in order");
}

#endif
