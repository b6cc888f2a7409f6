#include "platform/scheduler.h"

#include "atomic_file.h"
#include "common/text.h"
#include "platform/config_store.h"
#include "store.h"
#include "store_path.h"
#include "store_paths.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>
#include <string_view>

namespace device
{
namespace
{

constexpr const char *CRON_FILE = "/etc/cron.d/device_scheduler";
const std::string ROOT_PATH = "/system_mgr/crond";
const std::string GROUP_LIST = ROOT_PATH + "/list";

constexpr std::size_t USER = 5, RUN = 6;
constexpr std::array KEYS = {"minute", "hour", "day", "month", "weekday", "user", "run"};
using Entry = std::array<std::string, KEYS.size()>;

bool is_letter_or_digit(char c)
{
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9');
}

// A group is a node of its own beside the list of groups.
bool is_group_name(std::string_view group)
{
    const auto is_allowed = [](char c) { return is_letter_or_digit(c) || c == '_' || c == '-'; };
    return !group.empty() && group != "list" && std::all_of(group.begin(), group.end(), is_allowed);
}

std::string group_path(std::string_view group)
{
    return ROOT_PATH + "/" + std::string(group);
}

std::string item_path(const std::string &group, int number)
{
    return group + "/item:" + std::to_string(number);
}

std::string listed_name(int number)
{
    return GROUP_LIST + "/name:" + std::to_string(number);
}

int count_of(const std::string &list)
{
    return std::clamp(xml_get_int((list + "/count").c_str()), 0, StorePath::MAX_INDEX);
}

bool set(const std::string &path, const char *text)
{
    return xml_set_str(path.c_str(), text) == 0;
}

bool set_count(const std::string &list, int count)
{
    return xml_set_int((list + "/count").c_str(), count) == 0;
}

// The place of a group in the list of groups, from 1; 0 when it is not there.
int place_of(const char *group)
{
    const int count = count_of(GROUP_LIST);
    for (int i = 1; i <= count; ++i) {
        const auto name = store_text(listed_name(i));
        if (!name || *name == group) return name ? i : 0;
    }
    return 0;
}

bool list_group(const char *group)
{
    if (place_of(group) > 0) return true;
    const int count = count_of(GROUP_LIST) + 1;
    return set(listed_name(count), group) && set_count(GROUP_LIST, count);
}

bool has_control_character(std::string_view text)
{
    return std::any_of(text.begin(), text.end(), [](char c) { return bakjob::is_control(c) && c != '\t'; });
}

// Whether cron would read the line as the entry means it.
bool fits_cron(const Entry &entry)
{
    const auto is_word = [](const std::string &field) {
        return !field.empty() && field.find_first_of(" \t") == std::string::npos;
    };
    return std::none_of(entry.begin(), entry.end(), has_control_character) &&
           std::all_of(entry.begin(), entry.begin() + RUN, is_word) && !entry[RUN].empty();
}

// cron takes a bare per cent sign in a command for a line break.
std::string cron_line(const Entry &entry)
{
    std::string line;
    for (std::size_t i = 0; i <= USER; ++i) {
        line += entry[i] + ' ';
    }
    for (const char c : entry[RUN]) {
        if (c == '%') line += '\\';
        line += c;
    }
    return line + '\n';
}

std::string cron_lines(const std::string &group)
{
    std::string lines;
    const std::string path = group_path(group);
    const int count = count_of(path);
    // The first missing entry ends the list, whatever the count says.
    for (int number = 1; number <= count && store_text(item_path(path, number)); ++number) {
        Entry entry;
        for (std::size_t i = 0; i < KEYS.size(); ++i) {
            entry[i] = store_text(item_path(path, number) + "/" + KEYS[i]).value_or("");
        }
        if (fits_cron(entry)) {
            lines += cron_line(entry);
        } else {
            std::fprintf(stderr, "scheduler: %s is left out: cron cannot hold it\n",
                         item_path(path, number).c_str());
        }
    }
    return lines;
}

} // namespace
} // namespace device

using namespace device;

int LIB_create_xml(const char *minute, const char *hour, const char *day, const char *month,
                   const char *weekday, const char *user, const char *run, const char *group)
{
    const std::array<const char *, KEYS.size()> values = {minute, hour, day, month, weekday, user, run};
    if (std::count(values.begin(), values.end(), nullptr) > 0 || !group || !is_group_name(group)) return -1;
    const std::string path = group_path(group);
    const int number = count_of(path) + 1;
    // With a count that is too low, the new entry would replace an existing one.
    if (store_text(item_path(path, number))) return -1;
    if (place_of(group) == 0 && store_text(listed_name(count_of(GROUP_LIST) + 1))) return -1;
    for (std::size_t i = 0; i < KEYS.size(); ++i) {
        if (!set(item_path(path, number) + "/" + KEYS[i], values[i])) return -1;
    }
    if (!set_count(path, number) || !list_group(group)) return -1;
    return xml_write_file(STORE_FILE);
}

int LIB_do_delete_xml(const char *group)
{
    if (!group || !is_group_name(group)) return -1;
    const int place = place_of(group);
    const bool had_entries = xml_del(group_path(group).c_str()) == 0;
    if (!had_entries && place == 0) return -1;
    if (place > 0) {
        xml_del(listed_name(place).c_str());
        if (!set_count(GROUP_LIST, count_of(GROUP_LIST) - 1)) return -1;
    }
    return xml_write_file(STORE_FILE);
}

int LIB_do_ctc(void)
{
    if (!store_usable()) return -1;
    std::string lines;
    const int count = count_of(GROUP_LIST);
    for (int i = 1; i <= count; ++i) {
        const auto group = store_text(listed_name(i));
        if (!group) break;
        lines += cron_lines(*group);
    }
    if (replace_file(CRON_FILE, lines, {.mode = 0644}).on_disk) return 0;
    std::fprintf(stderr, "scheduler: cannot write %s: %s\n", CRON_FILE, std::strerror(errno));
    return -1;
}
