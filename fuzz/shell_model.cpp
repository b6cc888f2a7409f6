#include "shell_model.h"

namespace
{

constexpr std::string_view ACTS = "|&;<>()$`*?[{\n";
constexpr std::string_view ACTS_IN_FRONT = "~#";
constexpr std::string_view BLANKS = " \t";

bool holds(std::string_view set, char c)
{
    return set.find(c) != std::string_view::npos;
}

// Each reads what it is for from the front of `text` on to the end of `word`; false when it cannot.
bool read_single_quoted(std::string_view &text, std::string &word)
{
    const std::size_t end = text.find('\'', 1);
    if (end == std::string_view::npos) return false;
    word += text.substr(1, end - 1);
    text.remove_prefix(end + 1);
    return true;
}

bool read_double_quoted(std::string_view &text, std::string &word)
{
    for (text.remove_prefix(1); !text.empty(); text.remove_prefix(1)) {
        if (text.front() == '"') {
            text.remove_prefix(1);
            return true;
        }
        if (holds("$`", text.front())) return false;
        if (text.front() == '\\' && text.size() > 1 && holds("$`\"\\\n", text[1])) {
            if (text[1] == '\n') return false;
            text.remove_prefix(1);
        }
        word += text.front();
    }
    return false;
}

bool read_word(std::string_view &text, std::string &word)
{
    if (holds(ACTS_IN_FRONT, text.front())) return false;
    while (!text.empty() && !holds(BLANKS, text.front())) {
        if (text.front() == '\'') {
            if (!read_single_quoted(text, word)) return false;
        } else if (text.front() == '"') {
            if (!read_double_quoted(text, word)) return false;
        } else {
            if (holds(ACTS, text.front())) return false;
            if (text.front() == '\\') {
                text.remove_prefix(1);
                if (text.empty() || text.front() == '\n') return false;
            }
            word += text.front();
            text.remove_prefix(1);
        }
    }
    return true;
}

} // namespace

std::optional<std::vector<std::string>> shell_words(std::string_view text)
{
    std::vector<std::string> words;
    while (!text.empty()) {
        if (holds(BLANKS, text.front())) {
            text.remove_prefix(1);
            continue;
        }
        std::string word;
        if (!read_word(text, word)) return std::nullopt;
        words.push_back(word);
    }
    return words;
}

bool is_word(std::string_view text, std::string_view word)
{
    const auto words = shell_words(text);
    return words && words->size() == 1 && words->front() == word;
}

std::optional<std::string> between_backquotes(std::string_view text)
{
    std::string command;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] == '`') return std::nullopt;
        if (text[i] == '\\') {
            if (i + 1 == text.size()) return std::nullopt;
            if (holds("$`\\", text[i + 1])) ++i;
        }
        command += text[i];
    }
    return command;
}
