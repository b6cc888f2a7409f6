// The file that gives volumes their shared names.

#include "cli/local_paths.h"
#include "common/text.h"
#include "fuzz.h"

#include <algorithm>
#include <cstring>

using namespace bakjob;

namespace
{

constexpr std::string_view BLANKS = " \t\n\v\f\r";
constexpr std::size_t MAX_NAME = 63;

void check_words(std::string_view text)
{
    std::string plain(text);
    std::erase_if(plain, [](char c) { return contains(BLANKS, {&c, 1}); });
    std::string words;
    for (std::string_view word = next_word(text); !word.empty(); word = next_word(text)) {
        must(word.find_first_of(BLANKS) == std::string_view::npos, "a word holds no blank");
        must(text.empty() || contains(BLANKS, text.substr(0, 1)), "a word ends at a blank");
        words += word;
    }
    must(words == plain && text.empty(), "no word is left out");
}

bool is_name(std::string_view name)
{
    return name.size() <= MAX_NAME && name.find_first_of(BLANKS) == std::string_view::npos;
}

} // namespace

void check(std::string_view text)
{
    check_words(text);
    for (const std::string &line : lines_of(text)) {
        const std::string name = shared_name_of_line(line);
        must(is_name(name), "a name is a word that fits");
        must(name.empty() || line.find(name) == line.find_first_not_of(BLANKS), "a name begins its line");
    }
    write_file("/etc/shared_name", text);
    const std::string shared = rsync_shared_path("/mnt/HD/HD_a2/Public/x");
    const bool known = rsync_volume_is_shared("/mnt/HD/HD_a2/Public") == 1;
    must(shared.size() < PATH_SIZE, "a path fits");
    if (shared.empty()) return;
    constexpr std::string_view BELOW = "/Public/x";
    must(shared.starts_with('/') && shared.ends_with(BELOW) && shared.size() > BELOW.size() + 1,
         "a shared path is a name and what stands below the volume");
    const std::string name = shared.substr(1, shared.size() - 1 - BELOW.size());
    must(is_name(name) && contains(text, name), "the name is a word of the file");
    must(known || contains(text, std::string_view("\0", 1)) || text.size() > 127,
         "a volume with a name is shared");
}
