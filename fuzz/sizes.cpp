// Lines of df and du.

#include "remote/sizes.h"

#include "common/text.h"
#include "fuzz.h"

using namespace bakjob;

namespace
{

std::vector<std::string> words_of(std::string_view line)
{
    std::vector<std::string> words;
    std::string word;
    for (const char c : line) {
        if (!contains(" \t\n\v\f\r", {&c, 1})) {
            word += c;
        } else if (!word.empty()) {
            words.push_back(std::move(word));
            word.clear();
        }
    }
    if (!word.empty()) words.push_back(word);
    return words;
}

bool fits(const std::string &word)
{
    return word.size() < sizeof(SizeText) && !contains(word, std::string_view("\0", 1));
}

bool is_size(std::string_view text)
{
    return text == "N/A" || (!text.empty() && text.front() >= '0' && text.front() <= '9' &&
                             (text.size() == 1 || contains("kKMG", text.substr(text.size() - 1))));
}

} // namespace

void check(std::string_view line)
{
    const auto words = words_of(line);
    SizeText size = "earlier";
    size_of_df_line(line, size);
    must(is_terminated(size), "a size ends within its field");
    must(size == (words.size() > 3 && fits(words[3]) ? words[3] : "N/A"), "the fourth word, or none");

    for (const char *earlier : {"", "7G", "earlier"}) {
        copy_text(size, earlier);
        size_of_du_reply(line, size);
        must(is_terminated(size) && is_size(size), "a size is a size or N/A");
        const std::string_view text = size;
        must(text == "N/A" || text == (words.empty() ? earlier : words[0]), "the first word, or none");
    }
}
