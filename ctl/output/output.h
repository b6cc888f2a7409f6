#pragma once

// What the commands print: tables for people, JSON for programs. Whoever makes JSON includes
// <nlohmann/json.hpp>.

#include "common/text.h"

#include <nlohmann/json_fwd.hpp>
#include <string>
#include <string_view>
#include <vector>

namespace bakjob::ctl
{

using Json = nlohmann::ordered_json;
using Row = std::vector<std::string>;

// The start of the text that fits so many columns.
std::string_view fitting(std::string_view text, std::size_t columns);

// Columns as wide as their widest text, two blanks between them. An empty header prints none.
void print_table(const Row &header, const std::vector<Row> &rows);

// Text that is no UTF-8 has its bad bytes replaced. `indent` -1: one line.
void print_json(const Json &value, int indent = 2);

} // namespace bakjob::ctl
