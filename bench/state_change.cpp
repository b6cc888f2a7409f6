// What one change of a job's state costs, with the two sides of a comparison in turn:
//
//   bench_state_change bare PAIRS FILE         against parsing FILE and writing it once, without sync
//   bench_state_change synced PAIRS FILE       against parsing it and replacing two files, as a change does
//   bench_state_change per_job PAIRS FILE JOBS FILE JOBS   its part for each job of the first, of the second
//
// FILE is a configuration with a job "few", whose state changes. Prints the microseconds of each pair in a
// line: processor time, as the disk is memory here and other work on the machine would hit the longer side
// more. Every change begins with reading the file.

#include "atomic_file.h"
#include "bare_store.h"
#include "common/job_files.h"
#include "config/job_operations.h"
#include "config/job_state.h"

#include <chrono>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <fcntl.h>
#include <functional>
#include <malloc.h>
#include <span>
#include <sstream>
#include <string>
#include <string_view>

using namespace bakjob;

namespace
{

constexpr const char *JOB = "few";
constexpr const char *COPY = "/var/tmp/copy.xml";
constexpr const char *SECOND_COPY = "/var/lib/second_copy.xml";

using Microseconds = std::chrono::duration<double, std::micro>;

[[noreturn]] void fail(const char *what)
{
    std::fprintf(stderr, "bench_state_change: %s\n", what);
    std::exit(1);
}

int number(const char *text)
{
    return static_cast<int>(std::strtol(text, nullptr, 10));
}

// Freed memory stays with the process. Else what the kernel takes to hand pages out, which on virtual
// machines can be more than all the rest, would fall on one side or the other by chance.
void keep_memory()
{
    mallopt(M_TRIM_THRESHOLD, INT_MAX);
    mallopt(M_MMAP_THRESHOLD, 32 << 20);
}

void put_in_place(const std::string &text)
{
    if (!device::replace_file(CONFIG_FILE, text, {.mode = 0600}).on_disk) fail("cannot write the store");
}

std::string contents(const char *path)
{
    std::string text;
    const UniqueFd file(open(path, O_RDONLY | O_CLOEXEC));
    if (!file || !device::read_whole(file.get(), text)) fail("cannot read a file");
    return text;
}

Microseconds processor_time()
{
    timespec time{};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &time);
    return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

Microseconds time_of(const std::function<bool()> &work)
{
    const Microseconds start = processor_time();
    const bool done = work();
    const Microseconds end = processor_time();
    if (!done) fail("a side of the comparison failed");
    return end - start;
}

bool change()
{
    rsync_set_job_state(JOB, JOB_RUNNING);
    return true;
}

// The configuration as a save leaves it, with every key of every job.
std::string saved_form(const char *path)
{
    put_in_place(contents(path));
    RsyncJob job{};
    if (!change() || rsync_get_job(job, JOB) == 0 || job.state != JOB_RUNNING) {
        fail("the state did not change");
    }
    return contents(CONFIG_FILE);
}

Microseconds change_time(const std::string &text)
{
    // Lets go of what was read for the change before, so that this one does not have to.
    put_in_place("<config/>");
    rsync_job_exists(JOB);
    put_in_place(text);
    return time_of(change);
}

bool parse_and_replace_two()
{
    pugi::xml_document document;
    if (!document.load_file(CONFIG_FILE)) return false;
    std::ostringstream text;
    document.save(text, " ");
    return device::replace_file(COPY, text.view(), {.mode = 0600}).on_disk &&
           device::replace_file(SECOND_COPY, text.view(), {.mode = 0600}).on_disk;
}

void compare_with(const std::function<bool()> &other, int pairs, const char *file)
{
    const std::string text = saved_form(file);
    for (int i = 0; i < pairs; ++i) {
        const Microseconds ours = change_time(text);
        put_in_place(text);
        std::printf("%.1f %.1f\n", ours.count(), time_of(other).count());
    }
}

void compare_per_job(int pairs, std::span<char *const> files_and_jobs)
{
    const std::string first = saved_form(files_and_jobs[0]);
    const std::string second = saved_form(files_and_jobs[2]);
    const int first_jobs = number(files_and_jobs[1]);
    const int second_jobs = number(files_and_jobs[3]);
    for (int i = 0; i < pairs; ++i) {
        const Microseconds of_first = change_time(first) / first_jobs;
        std::printf("%.2f %.2f\n", of_first.count(), (change_time(second) / second_jobs).count());
    }
}

} // namespace

int main(int argc, char **argv)
{
    keep_memory();
    const std::span arguments(argv, static_cast<std::size_t>(argc));
    const std::string_view mode = argc > 3 ? arguments[1] : "";
    const int pairs = argc > 3 ? number(arguments[2]) : 0;
    if (mode == "bare" && argc == 4) {
        compare_with([] { return parse_and_write(CONFIG_FILE, COPY); }, pairs, arguments[3]);
    } else if (mode == "synced" && argc == 4) {
        compare_with(parse_and_replace_two, pairs, arguments[3]);
    } else if (mode == "per_job" && argc == 7) {
        compare_per_job(pairs, arguments.subspan(3));
    } else {
        std::fputs("usage: see the top of bench/state_change.cpp\n", stderr);
        return 2;
    }
    return 0;
}
