#include "config/job_store.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/text.h"
#include "config/job_list.h"
#include "config/schedule.h"
#include "config/store_text.h"
#include "platform/config_store.h"

#include <cstdio>
#include <cstring>
#include <memory>
#include <new>
#include <unordered_set>
#include <utility>

namespace bakjob
{

namespace
{

constexpr const char *JOBS = "/backup_mgr/rsync";
constexpr const char *JOB_COUNT = "/backup_mgr/rsync/count";
constexpr int MAX_GAP = 1000; // missing items in a row

constexpr const char *UNREADABLE = "the configuration cannot be read";
constexpr const char *WRONG_COUNT = "/backup_mgr/rsync/count is missing or below 1, but there are items";
constexpr const char *GAP = "/backup_mgr/rsync/count is much larger than the number of items";
constexpr const char *TWO_LISTS = "there are two lists of jobs, /backup_mgr/rsync";
constexpr const char *SAME_NAME = "the names of two jobs begin with the same 127 bytes";
constexpr const char *NO_MEMORY = "there is not enough memory";
constexpr const char *LONG_TEXT = "a text of a job is longer than 1 MiB";

// The path of one key of one item, reused from key to key, as there are tens of thousands. It allocates
// nothing: a save that has begun must not fail here.
class ItemPath
{
public:
    explicit ItemPath(int item) : key_(std::snprintf(path_, sizeof path_, "%s/item:%d/", JOBS, item)) {}
    const char *key(const char *name)
    {
        std::snprintf(path_ + key_, sizeof path_ - static_cast<std::size_t>(key_), "%s", name);
        return path_;
    }

private:
    char path_[128];
    int key_;
};

// Paths with a number are read from the tree that the count came from: a tree that could not be read is not
// read again and then taken for whole.
bool is_unreadable(int item)
{
    char start[2] = "";
    return xml_get_str(format_text("%s/item:%d", JOBS, item).c_str(), sizeof start, start) == XML_UNREADABLE;
}

const char *text_to_save(const RsyncJob &job, const JobField &field)
{
    const char *const text = text_field(job, field);
    const std::string *const whole = whole_text_of(job, field.key);
    return whole != nullptr && std::strlen(text) == field.size - 1 && whole->starts_with(text)
               ? whole->c_str()
               : text;
}

// Whether the field has all of the text at the path.
bool load_text(char *text, std::size_t size, const char *path)
{
    xml_get_str(path, static_cast<int>(size), text);
    return std::strlen(text) < size - 1 || store_text(path, size + 1).size() < size;
}

// Whether the store has anything of the item.
bool load_job(RsyncJob &job, int item)
{
    ItemPath path(item);
    bool found = false;
    WholeTexts whole_texts;
    for (const JobField &field : job_fields()) {
        const char *const key = path.key(field.key);
        if (!field.is_text()) {
            const int value = xml_get_int(key);
            integer_field(job, field) = field.in_range(value) ? value : field.otherwise.value_or(value);
            found |= value != -1;
        } else {
            char *const text = text_field(job, field);
            if (!load_text(text, field.size, key)) whole_texts[field.key] = whole_text(key);
            found |= text[0] != '\0';
        }
    }
    if (!whole_texts.empty()) job.whole_texts = std::make_shared<const WholeTexts>(std::move(whole_texts));
    return found;
}

bool has_endless_text(const RsyncJob &job)
{
    if (!job.whole_texts) return false;
    for (const auto &[key, text] : *job.whole_texts) {
        if (is_cut(text)) return true;
    }
    return false;
}

class JobLoader
{
public:
    explicit JobLoader(RsyncJobList &jobs) : jobs_(jobs) {}

    // Null, or why something is left out.
    const char *load()
    {
        const int count = xml_get_int(JOB_COUNT);
        int item = 1;
        for (; item <= count && missing_ < MAX_GAP; ++item) {
            try {
                load_item(item);
            } catch (const std::bad_alloc &) {
                failure_ = NO_MEMORY;
            }
        }
        if (missing_ >= MAX_GAP) return GAP;
        if (is_unreadable(item)) return UNREADABLE;
        if (store_has(format_text("%s:2", JOBS))) return TWO_LISTS;
        // A count that is too low is still taken: what follows may be left from an earlier, longer list.
        return count < 1 && store_has(format_text("%s/item:1", JOBS)) ? WRONG_COUNT : failure_;
    }

private:
    void load_item(int item)
    {
        auto job = std::make_unique<RsyncJob>();
        missing_ = load_job(*job, item) ? 0 : missing_ + 1;
        if (!names_.insert(job->job_name).second) {
            if (was_cut(*job, "job_name")) failure_ = SAME_NAME;
            return;
        }
        if (has_endless_text(*job)) failure_ = LONG_TEXT;
        rsync_list_take_job(jobs_, std::move(job));
    }

    RsyncJobList &jobs_;
    std::unordered_set<std::string> names_; // of the listed jobs
    int missing_ = 0;
    const char *failure_ = nullptr;
};

const char *load_or_say_why(RsyncJobList &jobs)
{
    try {
        return JobLoader(jobs).load();
    } catch (const std::bad_alloc &) {
        return NO_MEMORY;
    }
}

bool save_job(const RsyncJob &job, int item)
{
    ItemPath path(item);
    bool set = true;
    for (const JobField &field : job_fields()) {
        const char *const key = path.key(field.key);
        const int answer = field.is_text() ? xml_set_str(key, text_to_save(job, field))
                                           : xml_set_int(key, integer_field(job, field));
        set &= answer != XML_UNREADABLE;
    }
    return set;
}

// Whether the store has taken all of them.
bool save_list(const RsyncJobList &jobs)
{
    bool set = xml_del(JOBS) != XML_UNREADABLE;
    if (jobs.count > 0) set &= xml_set_int(JOB_COUNT, jobs.count) != XML_UNREADABLE;
    int item = 0;
    for (const RsyncJob *job = jobs.head; job != nullptr; job = job->next) {
        set &= save_job(*job, ++item);
    }
    return set;
}

} // namespace

bool rsync_load_jobs(RsyncJobList &jobs)
{
    jobs.clear();
    jobs.load_failure = load_or_say_why(jobs);
    if (jobs.load_failure == nullptr) return true;
    DebugLog("ERROR: jobs are left out: %s\n", jobs.load_failure);
    return false;
}

bool rsync_load_jobs()
{
    return rsync_load_jobs(*job_list);
}

bool rsync_save_jobs(RsyncJobList &jobs)
{
    const char *why = jobs.load_failure;
    if (why == nullptr && !save_list(jobs)) why = "a value could not be set";
    if (why != nullptr) {
        DebugLog("ERROR: jobs are not saved: %s\n", why);
        jobs.clear();
        return false;
    }
    const bool handed_over = rsync_prune_schedule(jobs);
    jobs.clear(); // before the write, which can use their memory
    if (xml_write_file(CONFIG_FILE) >= 0) return true;
    // The scheduler must not act on entries that the file does not have.
    if (handed_over) rsync_apply_schedule();
    return false;
}

bool rsync_save_jobs()
{
    return rsync_save_jobs(*job_list);
}

} // namespace bakjob
