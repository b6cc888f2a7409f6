#include "output/output.h"

#include <algorithm>
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

// Columns that a UTF-8 text takes, its combined and double-width characters aside.
std::size_t width_of(std::string_view text)
{
    return static_cast<std::size_t>(std::count_if(text.begin(), text.end(), begins_character));
}

} // namespace

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
    std::puts(value.dump(indent, ' ', true, Json::error_handler_t::replace).c_str());
    std::fflush(stdout);
}

} // namespace bakjob::ctl
