#include "output.h"

#include "common/text.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <nlohmann/json.hpp>

namespace bakjob::ctl
{

namespace
{

bool begins_character(char c)
{
    return (c & 0xC0) != 0x80;
}

// First bytes of UTF-8 characters of one length, and what their second byte may be; the others are plain
// continuations. Together they leave out what is too long, too high or half of a pair.
struct Lead {
    unsigned char first, last, second_from, second_to;
    std::size_t length;
};

constexpr std::array LEADS = {
    Lead{0x00, 0x7F, 0, 0, 1},       Lead{0xC2, 0xDF, 0x80, 0xBF, 2}, Lead{0xE0, 0xE0, 0xA0, 0xBF, 3},
    Lead{0xE1, 0xEC, 0x80, 0xBF, 3}, Lead{0xED, 0xED, 0x80, 0x9F, 3}, Lead{0xEE, 0xEF, 0x80, 0xBF, 3},
    Lead{0xF0, 0xF0, 0x90, 0xBF, 4}, Lead{0xF1, 0xF3, 0x80, 0xBF, 4}, Lead{0xF4, 0xF4, 0x80, 0x8F, 4},
};

// Bytes of the character that a text begins with; 0 when that is none of UTF-8.
std::size_t character_length(std::string_view text)
{
    const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
    for (const Lead &lead : LEADS) {
        if (byte(0) < lead.first || byte(0) > lead.last) continue;
        if (text.size() < lead.length) return 0;
        if (lead.length > 1 && (byte(1) < lead.second_from || byte(1) > lead.second_to)) return 0;
        const std::string_view rest = text.substr(0, lead.length).substr(1);
        return std::none_of(rest.begin(), rest.end(), begins_character) ? lead.length : 0;
    }
    return 0;
}

// Columns that a UTF-8 text takes, its combined and double-width characters aside.
std::size_t width_of(std::string_view text)
{
    return static_cast<std::size_t>(std::count_if(text.begin(), text.end(), begins_character));
}

} // namespace

std::string printable(std::string_view text)
{
    std::string result;
    while (!text.empty()) {
        const std::size_t length = character_length(text);
        const std::string_view character = text.substr(0, std::max<std::size_t>(length, 1));
        const bool acts = is_control(character[0]) || (character >= "\xC2\x80" && character < "\xC2\xA0");
        result += length == 0 || acts ? "?" : character;
        text.remove_prefix(character.size());
    }
    return result;
}

std::string_view fitting(std::string_view text, std::size_t columns)
{
    std::size_t length = 0;
    while (length < text.size() && (columns > 0 || !begins_character(text[length]))) {
        if (begins_character(text[length++])) --columns;
    }
    return text.substr(0, length);
}

void print_table(const Row &header, const std::vector<Row> &rows)
{
    std::vector<Row> all;
    if (!header.empty()) all.push_back(header);
    all.insert(all.end(), rows.begin(), rows.end());
    std::vector<std::size_t> widths;
    for (Row &row : all) {
        widths.resize(std::max(widths.size(), row.size()));
        for (std::size_t i = 0; i < row.size(); ++i) {
            row[i] = printable(row[i]);
            widths[i] = std::max(widths[i], width_of(row[i]));
        }
    }
    for (const Row &row : all) {
        std::string line;
        for (std::size_t i = 0; i < row.size(); ++i) {
            line += row[i];
            line.append(widths[i] - width_of(row[i]) + 2, ' ');
        }
        line.resize(line.find_last_not_of(' ') + 1);
        std::puts(line.c_str());
    }
}

void print_json(const Json &value, int indent)
{
    std::puts(value.dump(indent, ' ', false, Json::error_handler_t::replace).c_str());
    std::fflush(stdout);
}

} // namespace bakjob::ctl
