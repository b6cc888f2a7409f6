#include "common/text.h"

#include <algorithm>
#include <cstdio>
#include <cstring>

namespace bakjob
{

namespace
{

constexpr std::string_view ESCAPED = "$`#%^&(){}+;[]'= ";

bool is_trimmed(char c)
{
    const auto code = static_cast<unsigned char>(c);
    return code <= ' ' || code == 127;
}

struct Character {
    char32_t code;
    std::size_t length; // bytes; 0: no UTF-8
};

Character first_character(std::string_view text)
{
    const auto first = static_cast<unsigned char>(text.front());
    if (first < 0x80) return {first, 1};
    const std::size_t length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
    constexpr char32_t LOWEST[] = {0, 0, 0x80, 0x800, 0x10000}; // that takes so many bytes
    if (first < 0xC2 || first > 0xF4 || text.size() < length) return {0, 0};
    char32_t code = first & (0x7FU >> length);
    for (const char c : text.substr(1, length - 1)) {
        if ((c & 0xC0) != 0x80) return {0, 0};
        code = code << 6U | (static_cast<unsigned char>(c) & 0x3FU);
    }
    const bool surrogate = code >= 0xD800 && code < 0xE000;
    if (code < LOWEST[length] || surrogate || code > 0x10FFFF) return {0, 0};
    return {code, length};
}

bool is_unshown(char32_t code)
{
    // Control characters, and those that take no room or turn the direction of the text.
    constexpr char32_t RANGES[][2] = {{0, 0x1F},        {0x7F, 0x9F},      {0xAD, 0xAD},     {0x61C, 0x61C},
                                      {0x200B, 0x200F}, {0x2028, 0x202E},  {0x2060, 0x206F}, {0xFEFF, 0xFEFF},
                                      {0xFFF9, 0xFFFB}, {0xE0000, 0xE007F}};
    return std::any_of(std::begin(RANGES), std::end(RANGES),
                       [&](const auto &range) { return code >= range[0] && code <= range[1]; });
}

} // namespace

std::string format_text(const char *format, va_list arguments)
{
    va_list again;
    va_copy(again, arguments);
    const int length = std::vsnprintf(nullptr, 0, format, again);
    va_end(again);
    std::string text(length > 0 ? static_cast<std::size_t>(length) : 0, '\0');
    if (length > 0) std::vsnprintf(text.data(), text.size() + 1, format, arguments);
    return text;
}

std::string format_text(const char *format, ...)
{
    va_list arguments;
    va_start(arguments, format);
    std::string text = format_text(format, arguments);
    va_end(arguments);
    return text;
}

bool holds_control(std::string_view text)
{
    return std::any_of(text.begin(), text.end(), is_control);
}

std::string printable(std::string_view text)
{
    std::string shown;
    while (!text.empty()) {
        const Character character = first_character(text);
        const bool plain = character.length > 0 && !is_unshown(character.code);
        shown += plain ? text.substr(0, character.length) : "?";
        text.remove_prefix(std::max<std::size_t>(character.length, 1));
    }
    return shown;
}

bool read_line(std::FILE *file, std::string &line)
{
    line.clear();
    int c = std::getc(file);
    if (c == EOF) return false;
    for (; c != EOF && c != '\n'; c = std::getc(file)) {
        if (line.size() < LINE_LENGTH) {
            line += static_cast<char>(c);
        } else {
            line.back() = '?'; // nobody may trim the line to a shorter one
        }
    }
    return true;
}

std::string_view next_word(std::string_view &text)
{
    constexpr std::string_view BLANKS = " \t\n\v\f\r";
    text.remove_prefix(std::min(text.find_first_not_of(BLANKS), text.size()));
    const std::string_view word = text.substr(0, text.find_first_of(BLANKS));
    text.remove_prefix(word.size());
    return word;
}

void trim_right(char *text)
{
    std::size_t length = std::strlen(text);
    while (length > 0 && is_trimmed(text[length - 1])) {
        text[--length] = '\0';
    }
}

void trim_right(std::string &text)
{
    while (!text.empty() && is_trimmed(text.back())) {
        text.pop_back();
    }
}

std::string escape_path(std::string_view path)
{
    std::string escaped;
    for (const char c : path) {
        if (contains(ESCAPED, {&c, 1})) escaped += '\\';
        escaped += c;
    }
    return escaped;
}

} // namespace bakjob
