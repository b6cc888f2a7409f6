#pragma once

// What a shell makes of a piece of a command, as a model: quotes and backslashes taken away.

#include <optional>
#include <string>
#include <string_view>
#include <vector>

// The words of the text, or nothing when a shell would do more than take quotes away: expand, match file
// names, start or end a command. Takes both shells in account that read our commands, so braces count too.
std::optional<std::vector<std::string>> shell_words(std::string_view text);

// Whether a shell reads the text as exactly this one word.
bool is_word(std::string_view text, std::string_view word);

// What a shell runs of a command between backquotes.
std::optional<std::string> between_backquotes(std::string_view text);
