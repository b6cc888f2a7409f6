#pragma once

// Small text routines: formatting, reading, trimming, and the escape rule for paths. The rules about what may
// go into a command at all are in shell_text.h.

#include "common/fixed_text.h"

#include <charconv>
#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>

namespace bakjob
{

// printf into a string of whatever length it takes.
[[gnu::format(printf, 1, 2)]] std::string format_text(const char *format, ...);
[[gnu::format(printf, 1, 0)]] std::string format_text(const char *format, va_list arguments);

inline bool contains(std::string_view text, std::string_view part)
{
    return text.find(part) != std::string_view::npos;
}

inline bool is_control(char c)
{
    const auto code = static_cast<unsigned char>(c);
    return code < ' ' || code == 127;
}

bool holds_control(std::string_view text);

// The text with '?' for whatever a terminal would act on instead of showing it: control characters, also
// those above 127, what turns the direction of writing, and bytes that are no UTF-8.
std::string printable(std::string_view text);

// Reads a line from a foreign text, without its line break; false at the end. Of a line longer than
// LINE_LENGTH only so much is kept, which is more than fits any field: it is refused there, not taken for
// another.
inline constexpr std::size_t LINE_LENGTH = 4095;
bool read_line(std::FILE *file, std::string &line);

// The first blank-separated word of a text, which it leaves in front of what follows; empty at the end.
std::string_view next_word(std::string_view &text);

// The number that the whole text is: digits, and for a signed one perhaps a minus sign. Nullopt for any other
// text, and for a number that does not fit.
template <class Number>
std::optional<Number> whole_number(std::string_view text)
{
    Number number = 0;
    const char *const end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, number);
    return error == std::errc() && stop == end ? std::optional<Number>(number) : std::nullopt;
}

// The same for one that must lie within lowest..highest.
inline std::optional<int> whole_number(std::string_view text, int lowest, int highest)
{
    const auto number = whole_number<int>(text);
    return number && *number >= lowest && *number <= highest ? number : std::nullopt;
}

// Removes trailing white space and control characters (those of the C locale) in place.
void trim_right(char *text);
void trim_right(std::string &text);

// The text with a backslash before each of the characters $ ` # % ^ & ( ) + { } ; [ ] ' = and blank.
std::string escape_path(std::string_view path);

} // namespace bakjob
