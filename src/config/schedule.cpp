#include "config/schedule.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "config/job_list.h"
#include "config/store_text.h"
#include "platform/scheduler.h"

#include <algorithm>
#include <array>
#include <unordered_set>

namespace bakjob
{

namespace
{

constexpr const char *GROUP = "rsync";
constexpr const char *GROUP_NODE = "/system_mgr/crond/rsync";
constexpr const char *ENTRY_COUNT = "/system_mgr/crond/rsync/count";
constexpr const char *GROUP_COUNT = "/system_mgr/crond/list/count";
constexpr std::size_t TEXT_SIZE = MAX_SCHEDULED_COMMAND + 1; // of a group's name or a command
constexpr int MAX_ENTRIES = 10'000;

struct EntryKey {
    const char *key;
    std::string ScheduleEntry::*text;
};

constexpr std::array ENTRY_KEYS = {
    EntryKey{"minute", &ScheduleEntry::minute},   EntryKey{"hour", &ScheduleEntry::hour},
    EntryKey{"day", &ScheduleEntry::day},         EntryKey{"month", &ScheduleEntry::month},
    EntryKey{"weekday", &ScheduleEntry::weekday}, EntryKey{"user", &ScheduleEntry::user},
    EntryKey{"run", &ScheduleEntry::run},
};

struct Group {
    int groups;            // number of groups that the scheduler has
    std::string name_path; // where the name of ours stands; empty: there is none
};

// A count beyond all reason is damage: no entry is read or deleted.
int bounded_count(const char *path)
{
    const int count = xml_get_int(path);
    if (count <= MAX_ENTRIES) return count;
    DebugLog("ERROR: [%s] refused: %d\n", path, count);
    return 0;
}

std::string group_name_path(int group)
{
    return format_text("/system_mgr/crond/list/name:%d", group);
}

Group find_group()
{
    Group group{bounded_count(GROUP_COUNT), {}};
    for (int i = 1; i <= group.groups; ++i) {
        std::string path = group_name_path(i);
        if (store_text(path, TEXT_SIZE) == GROUP) {
            group.name_path = std::move(path);
            break;
        }
    }
    return group;
}

std::string entry_path(const std::string &group_node, int entry)
{
    return format_text("%s/item:%d", group_node.c_str(), entry);
}

std::string entry_path(int entry)
{
    return entry_path(GROUP_NODE, entry);
}

// The start of the command, which is all of an ordinary one.
std::string entry_command(int entry)
{
    return store_text(entry_path(entry) + "/run", TEXT_SIZE + 1);
}

// Most texts are short, and room for a long one costs time.
std::string text_at(const std::string &path)
{
    std::string text = store_text(path, TEXT_SIZE + 1);
    return text.size() < TEXT_SIZE ? text : whole_text(path);
}

std::string whole_entry_command(int entry)
{
    return text_at(entry_path(entry) + "/run");
}

ScheduleEntry read_entry(const std::string &path)
{
    ScheduleEntry entry;
    for (const EntryKey &key : ENTRY_KEYS) {
        entry.*key.text = text_at(path + '/' + key.key);
    }
    return entry;
}

bool write_entry(const std::string &path, const ScheduleEntry &entry)
{
    return std::all_of(ENTRY_KEYS.begin(), ENTRY_KEYS.end(), [&](const EntryKey &key) {
        return set_store_text(path + '/' + key.key, entry.*key.text);
    });
}

void delete_entry(int entry, int entries_left)
{
    xml_del(entry_path(entry).c_str());
    set_store_decimal(ENTRY_COUNT, entries_left);
}

bool list_group(int number)
{
    return set_store_text(group_name_path(number), GROUP) && set_store_decimal(GROUP_COUNT, number);
}

void delete_group(const Group &group)
{
    xml_del(group.name_path.c_str());
    set_store_decimal(GROUP_COUNT, group.groups - 1);
    xml_del(GROUP_NODE);
}

using Names = std::unordered_set<std::string_view>;

Names names_of(const RsyncJobList &jobs)
{
    Names names;
    for (const RsyncJob *job = jobs.head; job != nullptr; job = job->next) {
        names.insert(job->job_name);
    }
    return names;
}

// Whether the command has one of the names in single quotes. A name may hold single quotes itself. Entries
// are as many as jobs, so comparing each entry with each name would take too long.
bool names_one_of(const Names &names, std::string_view command)
{
    for (std::size_t open = command.find('\''); open < command.size(); open = command.find('\'', open + 1)) {
        const std::string_view rest = command.substr(open + 1, JOB_NAME_SIZE);
        for (std::size_t close = rest.find('\''); close < rest.size(); close = rest.find('\'', close + 1)) {
            if (names.contains(rest.substr(0, close))) return true;
        }
    }
    return false;
}

bool names(std::string_view command, std::string_view job_name)
{
    return contains(command, '\'' + std::string(job_name) + '\'');
}

// Deletes the entries whose command `goes`, and the group when none is left. How many were deleted.
template <class Goes>
int delete_entries(const Goes &goes)
{
    const Group group = find_group();
    if (group.name_path.empty()) return 0;
    const int entries = bounded_count(ENTRY_COUNT);
    int remaining = entries;
    int entry = 1; // the entries behind a deleted one move up to its number
    for (int visited = 0; visited < entries; ++visited) {
        if (!goes(whole_entry_command(entry))) {
            ++entry;
        } else if (remaining == 1) {
            delete_group(group);
            return entries;
        } else {
            delete_entry(entry, --remaining);
        }
    }
    return entries - remaining;
}

int first_entry_holding(const char *job_name, int entries)
{
    for (int entry = 1; entry <= entries; ++entry) {
        if (contains(entry_command(entry), job_name)) return entry;
    }
    return 0;
}

} // namespace

int rsync_schedule_names_job(std::string_view command)
{
    return names_one_of(names_of(*job_list), command) ? 1 : 0;
}

// A command that was cut may name a job behind the cut, so it stays.
bool rsync_prune_schedule(const RsyncJobList &jobs)
{
    const Names listed = names_of(jobs);
    const int deleted = delete_entries(
        [&](const std::string &command) { return !is_cut(command) && !names_one_of(listed, command); });
    if (deleted > 0) LIB_do_ctc();
    return deleted > 0;
}

bool rsync_prune_schedule()
{
    return rsync_prune_schedule(*job_list);
}

bool rsync_schedules_job(const RsyncJobList &jobs, std::string_view command, std::string_view job_name)
{
    if (!names(command, job_name)) return false;
    for (const RsyncJob *job = jobs.head; job != nullptr; job = job->next) {
        const std::string_view other = job->job_name;
        if (other.size() > job_name.size() && names(command, other)) return false;
    }
    return true;
}

std::vector<ScheduleEntry> rsync_job_schedule(const RsyncJobList &jobs, std::string_view job_name)
{
    std::vector<ScheduleEntry> found;
    const int entries = find_group().name_path.empty() ? 0 : bounded_count(ENTRY_COUNT);
    for (int entry = 1; entry <= entries; ++entry) {
        if (!rsync_schedules_job(jobs, whole_entry_command(entry), job_name)) continue;
        found.push_back(read_entry(entry_path(entry)));
    }
    return found;
}

std::vector<ScheduleEntry> rsync_all_schedules()
{
    std::vector<ScheduleEntry> all;
    const int groups = bounded_count(GROUP_COUNT);
    for (int group = 1; group <= groups; ++group) {
        const std::string node = "/system_mgr/crond/" + store_text(group_name_path(group), TEXT_SIZE);
        const int entries = bounded_count((node + "/count").c_str());
        for (int entry = 1; entry <= entries; ++entry) {
            all.push_back(read_entry(entry_path(node, entry)));
        }
    }
    return all;
}

bool rsync_add_schedule(const ScheduleEntry &entry)
{
    const Group group = find_group();
    const int groups = std::max(xml_get_int(GROUP_COUNT), 0);
    const int entries = std::max(xml_get_int(ENTRY_COUNT), 0);
    const std::string path = entry_path(entries + 1);
    if (std::max(groups, entries) >= MAX_ENTRIES) return false;
    if (store_has(path)) return false;
    if (group.name_path.empty() && store_has(group_name_path(groups + 1))) return false;
    const bool added = write_entry(path, entry) && (!group.name_path.empty() || list_group(groups + 1)) &&
                       set_store_decimal(ENTRY_COUNT, entries + 1);
    if (!added) xml_del(path.c_str());
    return added;
}

int rsync_unschedule_job(const RsyncJobList &jobs, std::string_view job_name)
{
    return delete_entries(
        [&](const std::string &command) { return rsync_schedules_job(jobs, command, job_name); });
}

void rsync_remove_job_schedule(const char *job_name)
{
    const Group group = find_group();
    if (group.groups <= 0) return;
    if (group.name_path.empty()) {
        DebugLog("NOT FOUND (0) this job name [%s]\n", job_name);
        return;
    }
    DebugLog("compare name = [%s]\n", job_name);
    const int entries = bounded_count(ENTRY_COUNT);
    if (entries <= 0) return;
    const int entry = first_entry_holding(job_name, entries);
    if (entry == 0) {
        DebugLog("NOT FOUND (%d) this job name [%s]\n", entries == 1 ? 1 : 2, job_name);
        return;
    }
    if (entries == 1) {
        delete_group(group);
    } else {
        delete_entry(entry, entries - 1);
    }
    xml_write_file(CONFIG_FILE);
    LIB_do_ctc();
}

int rsync_create_schedule(const char *minute, const char *hour, const char *day, const char *month,
                          const char *weekday, const char *user, const char *run)
{
    const int created = LIB_create_xml(minute, hour, day, month, weekday, user, run, GROUP);
    const int taken_over = LIB_do_ctc();
    return created >= 0 && taken_over >= 0 ? 1 : 0;
}

int rsync_apply_schedule()
{
    return LIB_do_ctc() >= 0 ? 1 : 0;
}

void rsync_delete_schedule()
{
    LIB_do_delete_xml(GROUP);
    LIB_do_ctc();
}

} // namespace bakjob
