#include "config/job_store.h"

#include "common/job_files.h"
#include "common/text.h"
#include "config/job_list.h"
#include "config/schedule.h"
#include "config/store_text.h"
#include "platform/config_store.h"

#include <cstdio>
#include <cstring>
#include <map>
#include <memory>
#include <string_view>
#include <unordered_set>
#include <utility>

namespace bakjob
{

namespace
{

constexpr const char *JOBS = "/backup_mgr/rsync";
constexpr const char *JOB_COUNT = "/backup_mgr/rsync/count";

// The path of one key of one item; reused from key to key, as there are tens of thousands of them.
class ItemPath
{
public:
    explicit ItemPath(int item) : path_(format_text("%s/item:%d/", JOBS, item)), length_(path_.size()) {}
    const char *key(const char *name)
    {
        path_.resize(length_);
        path_ += name;
        return path_.c_str();
    }

private:
    std::string path_;
    std::size_t length_;
};

// Texts that did not fit their field, by job and key, from the load to the save: the job cannot use them, but
// a save for another job's sake must not lose them.
std::map<std::pair<std::string, std::string>, std::string> uncut_texts;

const char *text_to_save(const RsyncJob &job, const JobField &field)
{
    const char *const text = text_field(job, field);
    if (std::strlen(text) < field.size - 1) return text;
    const auto uncut = uncut_texts.find({job.job_name, field.key});
    return uncut != uncut_texts.end() && uncut->second.starts_with(text) ? uncut->second.c_str() : text;
}

// Whether the store has anything of the item.
bool load_job(RsyncJob &job, int item)
{
    ItemPath path(item);
    bool found = false;
    std::uint32_t bit = 1;
    for (const JobField &field : job_fields()) {
        const char *const key = path.key(field.key);
        if (field.size == 0) {
            const int value = xml_get_int(key);
            const bool in_range = value >= field.lowest && value <= field.highest;
            integer_field(job, field) = in_range ? value : field.otherwise;
            found |= value != -1;
        } else {
            char *const text = text_field(job, field);
            xml_get_str(key, static_cast<int>(field.size), text);
            const std::size_t length = std::strlen(text);
            // A text that fills its field may be the start of a longer one.
            const bool full = length == field.size - 1;
            if (full && store_text(key, field.size + 1).size() == field.size) job.cut_fields |= bit;
            found |= length > 0;
        }
        bit <<= 1;
    }
    return found;
}

void keep_uncut_texts(const RsyncJob &job, int item)
{
    ItemPath path(item);
    for (const JobField &field : job_fields()) {
        if (was_cut(job, field.key)) uncut_texts[{job.job_name, field.key}] = whole_text(path.key(field.key));
    }
}

void save_job(const RsyncJob &job, int item)
{
    ItemPath path(item);
    for (const JobField &field : job_fields()) {
        const char *const key = path.key(field.key);
        if (field.size == 0) {
            xml_set_int(key, integer_field(job, field));
        } else {
            xml_set_str(key, text_to_save(job, field));
        }
    }
}

} // namespace

void rsync_load_jobs()
{
    rsync_free_jobs();
    uncut_texts.clear();
    std::unordered_set<std::string_view> names; // of the listed records
    const int count = xml_get_int(JOB_COUNT);
    for (int item = 1; item <= count; ++item) {
        std::unique_ptr<RsyncJob> job(rsync_new_job());
        if (!job) break;
        const bool found = load_job(*job, item);
        const bool is_new = names.insert(job->job_name).second;
        // Behind an item that is not there is none, whatever the count says.
        if (!found && !is_new) break;
        if (!is_new) continue;
        if (job->cut_fields != 0) keep_uncut_texts(*job, item);
        rsync_list_take_job(std::move(job));
    }
}

bool rsync_save_jobs()
{
    xml_del(JOBS);
    if (rsync_job_list_empty() == 0) xml_set_int(JOB_COUNT, job_list->count);
    int item = 0;
    for (const RsyncJob *job = job_list->head; job != nullptr; job = job->next) {
        save_job(*job, ++item);
    }
    const bool handed_over = rsync_prune_schedule();
    rsync_free_jobs(); // before the write, which can use their memory
    if (xml_write_file(CONFIG_FILE) >= 0) return true;
    // The scheduler is not to go by what the file does not say.
    if (handed_over) rsync_apply_schedule();
    return false;
}

} // namespace bakjob
