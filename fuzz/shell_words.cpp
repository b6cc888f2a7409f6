// Texts that go into commands, quoted or refused.

#include "common/shell_text.h"
#include "common/text.h"
#include "fuzz.h"
#include "shell_model.h"

#include <cstring>

using namespace bakjob;

namespace
{

// The text that a basic regular expression without any special character stands for.
std::optional<std::string> text_of_pattern(std::string_view pattern)
{
    constexpr std::string_view SPECIAL = ".[]*^$\\";
    std::string text;
    for (std::size_t i = 0; i < pattern.size(); ++i) {
        if (pattern[i] == '\\') {
            if (++i == pattern.size() || !contains(SPECIAL, pattern.substr(i, 1))) return std::nullopt;
        } else if (contains(SPECIAL, pattern.substr(i, 1))) {
            return std::nullopt;
        }
        text += pattern[i];
    }
    return text;
}

void check_quotes(const std::string &text)
{
    must(is_word(in_single_quotes(text), text), "single quotes keep everything");
    must(is_word(in_double_quotes(text), text), "double quotes keep everything");
    must(between_backquotes(in_backquotes(text)) == text, "backquotes keep everything");
}

void check_job_name(const std::string &name)
{
    must(!name.empty() && name.size() <= 127 && !contains(name, "/"), "a job's name is a file's name");
    const std::string word = "x" + shell_word(name);
    must(is_word(word, "x" + name), "a name is part of one word");
    must(is_word(*between_backquotes(in_backquotes(word)), "x" + name), "between backquotes as well");
    must(is_word(in_single_quotes(word), word), "and quoted for another shell");
    const auto pattern = shell_words("x" + grep_word(name));
    must(pattern && pattern->size() == 1, "a pattern is part of one word");
    must(text_of_pattern(pattern->front()) == "x" + name, "a name is no pattern");
}

void check_path(const std::string &text)
{
    if (const auto part = shell_path_part("path", text)) {
        must(part->size() < PATH_SIZE, "an escaped path fits");
        must(is_word("x" + *part, "x" + text), "a path is part of one word");
    }
    const auto path = shell_path("path", text);
    must(!path || (text.empty() ? path->empty() : is_word(*path, text)), "a path is one word");
    must(!path || !path->starts_with('-'), "a path is no option");
}

void check_escape_in_place(const std::string &text)
{
    if (text.size() >= PATH_SIZE || contains(text, std::string_view("\0", 1))) return;
    const std::string whole = escape_path(text);
    char field[PATH_SIZE] = "";
    copy_text(field, text);
    const char *const result = fix_path_special_char(field);
    must(is_terminated(field), "an escaped text ends within its buffer");
    must((result == nullptr) == (whole == text), "an answer means that something was escaped");
    must(whole.starts_with(field) && std::strlen(field) >= std::min(whole.size(), PATH_SIZE - 2),
         "what fits is escaped");
}

void check_plain(const std::string &text)
{
    const bool plain = !refusal_of_host(text) || !refusal_of_rsync_user(text) || !refusal_of_ssh_user(text);
    must(!plain || text.empty() || is_word("x" + text, "x" + text), "a name that passes is plain");
    must(!plain || !text.starts_with('-'), "a name is no option");
    if (!refusal_of_port(text)) {
        const std::string port = text.substr(0, text.find_last_not_of(' ') + 1);
        must(is_word("x" + text, "x" + port), "a port that passes is plain");
    }
    if (!refusal_of_base64("password", text)) must(is_word("x" + text, "x" + text), "base64 text is plain");
}

} // namespace

void check(std::string_view input)
{
    const std::string text(input);
    check_quotes(text);
    if (is_job_name(text)) check_job_name(text);
    check_path(text);
    check_escape_in_place(text);
    check_plain(text);
}
