// The configuration file: jobs loaded from whatever stands there, and saved again.

#include "store.h"

#include "config/job_list.h"
#include "config/job_store.h"
#include "config/schedule.h"
#include "fuzz.h"
#include "platform/config_store.h"
#include "store_paths.h"

#include <algorithm>
#include <cstring>
#include <sys/stat.h>
#include <unistd.h>

using namespace bakjob;

namespace
{

// A new file each time, as another process would write it.
void replace_store(std::string_view text)
{
    constexpr const char *FRESH = "/etc/NAS_CFG/fresh";
    write_file(FRESH, text);
    must(std::rename(FRESH, device::STORE_FILE) == 0, "a file can be replaced");
}

std::vector<RsyncJob> loaded_jobs()
{
    rsync_load_jobs();
    std::vector<RsyncJob> jobs;
    for (const RsyncJob *job = job_list->head; job != nullptr; job = job->next) {
        for (const JobField &field : job_fields()) {
            must(!field.is_text() || std::memchr(text_field(*job, field), '\0', field.size) != nullptr,
                 "texts end within their fields");
            must(field.is_text() || !field.otherwise || field.in_range(integer_field(*job, field)),
                 "numbers stay within their range");
        }
        must(rsync_find_job(job->job_name) == job, "a name is listed once");
        jobs.push_back(*job);
    }
    must(jobs.size() == static_cast<std::size_t>(job_list->count), "the list holds as many as it counts");
    return jobs;
}

bool is_same(const RsyncJob &one, const RsyncJob &other)
{
    for (const JobField &field : job_fields()) {
        if (!field.is_text() && integer_field(one, field) != integer_field(other, field)) return false;
        if (field.is_text() && std::strcmp(text_field(one, field), text_field(other, field)) != 0)
            return false;
    }
    return true;
}

void check_schedule()
{
    const int entries = xml_get_int("/system_mgr/crond/rsync/count");
    if (xml_get_int("/system_mgr/crond/list/count") <= 0 || entries > 10'000) return;
    if (device::store_text("/system_mgr/crond/list/name:1") != "rsync") return;
    for (int entry = 1; entry <= entries; ++entry) {
        const auto run = device::store_text("/system_mgr/crond/rsync/item:" + std::to_string(entry) + "/run");
        must(run && (run->size() > 255 || rsync_schedule_names_job(*run) == 1), "an entry names a job");
    }
}

} // namespace

void check(std::string_view file)
{
    replace_store(file);
    const auto jobs = loaded_jobs();
    const bool usable = device::store_usable();
    must(usable || jobs.empty(), "a damaged file has no jobs");
    const bool has_two_lists = device::store_text("/backup_mgr/rsync:2").has_value();
    rsync_save_jobs();
    must(rsync_job_list_empty() == 1, "a save empties the list");
    const std::string saved = read_file(device::STORE_FILE);
    if (!usable) {
        must(saved == file, "a damaged file stays as it is");
        return;
    }

    // The save takes one list away, and the other comes up.
    if (has_two_lists) return;

    // Read anew, as the next process does.
    replace_store(saved);
    must(device::store_usable(), "what was saved can be read");
    const auto again = loaded_jobs();
    must(again.size() == jobs.size(), "no job is lost or made up");
    for (std::size_t i = 0; i < jobs.size(); ++i) {
        must(is_same(jobs[i], again[i]), "a job comes back as it was");
        const bool all_cut =
            std::all_of(job_fields().begin(), job_fields().end(), [&](const JobField &field) {
                return was_cut(jobs[i], field.key) == was_cut(again[i], field.key);
            });
        must(all_cut, "a text that was cut does not pass for a whole one");
    }
    check_schedule();
}
