#include "jobs/cron.h"

#include "common/text.h"
#include "output/failure.h"

#include <algorithm>
#include <optional>
#include <span>
#include <string_view>

namespace bakjob::ctl
{

namespace
{

constexpr std::array<std::string_view, 12> MONTHS = {"jan", "feb", "mar", "apr", "may", "jun",
                                                     "jul", "aug", "sep", "oct", "nov", "dec"};
constexpr std::array<std::string_view, 7> WEEKDAYS = {"sun", "mon", "tue", "wed", "thu", "fri", "sat"};

struct CronField {
    const char *name;
    int lowest;
    int highest;
    std::span<const std::string_view> words; // for the numbers from the lowest
};

constexpr std::array<CronField, 5> FIELDS = {{{"minute", 0, 59, {}},
                                              {"hour", 0, 23, {}},
                                              {"day", 1, 31, {}},
                                              {"month", 1, 12, MONTHS},
                                              {"weekday", 0, 7, WEEKDAYS}}};

// What stands in front of the separator, which goes too.
std::string_view cut_at(std::string_view &text, char separator)
{
    const std::size_t length = std::min(text.find(separator), text.size());
    const std::string_view part = text.substr(0, length);
    text.remove_prefix(std::min(length + 1, text.size()));
    return part;
}

std::optional<int> value_in(std::string_view text, const CronField &field)
{
    std::string lower(text);
    std::transform(lower.begin(), lower.end(), lower.begin(),
                   [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c; });
    const auto word = std::find(field.words.begin(), field.words.end(), lower);
    if (word != field.words.end()) return field.lowest + static_cast<int>(word - field.words.begin());
    return whole_number(text, field.lowest, field.highest);
}

// "*", "N" or "N-M", and behind the first and the last perhaps "/STEP".
bool is_range(std::string_view text, const CronField &field)
{
    const bool stepped = contains(text, "/");
    std::string_view range = cut_at(text, '/');
    if (stepped && !whole_number(text, 1, field.highest)) return false;
    if (range == "*") return true;
    const bool open = contains(range, "-");
    if (stepped && !open) return false;
    const auto first = value_in(cut_at(range, '-'), field);
    if (!open) return first.has_value();
    const auto last = value_in(range, field);
    return first && last && *first <= *last;
}

bool is_list(std::string_view text, const CronField &field)
{
    if (text.empty() || text.back() == ',') return false;
    while (!text.empty()) {
        if (!is_range(cut_at(text, ','), field)) return false;
    }
    return true;
}

} // namespace

CronTimes parse_cron_times(const std::string &text)
{
    CronTimes times;
    std::string_view rest = text;
    for (std::size_t i = 0; i < FIELDS.size(); ++i) {
        const CronField &field = FIELDS[i];
        times[i] = next_word(rest);
        if (is_list(times[i], field)) continue;
        throw Failure(std::string(field.name) + ": \"" + times[i] + "\" is not allowed; allowed: *, " +
                      std::to_string(field.lowest) + " to " + std::to_string(field.highest) +
                      ", ranges such as 1-5, steps such as */2, and lists of these with commas");
    }
    const std::string_view more = next_word(rest);
    if (more.empty()) return times;
    throw Failure("\"" + std::string(more) +
                  "\": five fields are allowed: minute, hour, day, month, weekday");
}

} // namespace bakjob::ctl
