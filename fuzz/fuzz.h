#pragma once

// What the fuzz programs share. Each has one `check`, which reads a made-up text as the module would and ends
// the program when a rule does not hold.

#include "common/handles.h"
#include "config/remote_modules.h"

#include <functional>
#include <string>
#include <string_view>
#include <vector>

void check(std::string_view text);

// Ends the program, with the rule as its last words, when it does not hold.
void must(bool holds, const char *rule);

bakjob::UniqueFile open_text(std::string_view text);
void write_file(const char *path, std::string_view text);
std::string read_file(const char *path);

// The lines of a text, whole however long, without their breaks.
std::vector<std::string> lines_of(std::string_view text);
std::string trimmed(std::string text);

// Whether the module list is linked as it counts, holds no name twice and only modules that `known` knows.
void check_module_list(const std::function<bool(const bakjob::RemoteModule &)> &known);

template <std::size_t N>
bool is_terminated(const char (&field)[N])
{
    return std::string_view(field, N).find('\0') != std::string_view::npos;
}
