#include "common/fixed_text.h"

#include "common/text.h"

#include <cstring>

namespace bakjob
{

bool copy_text(char *field, std::size_t size, std::string_view source)
{
    if (source.size() >= size || source.find('\0') != std::string_view::npos) return false;
    std::memmove(field, source.data(), source.size());
    field[source.size()] = '\0';
    return true;
}

} // namespace bakjob

char *fix_path_special_char(char *text)
{
    const std::string escaped = bakjob::escape_path(text);
    if (escaped == text) return nullptr;
    std::size_t length = escaped.size();
    if (length >= bakjob::PATH_SIZE) {
        length = bakjob::PATH_SIZE - 1;
        // A backslash without its character would escape whatever the caller writes next.
        std::size_t backslashes = 0;
        while (backslashes < length && escaped[length - 1 - backslashes] == '\\') {
            ++backslashes;
        }
        length -= backslashes % 2;
    }
    std::memcpy(text, escaped.data(), length);
    text[length] = '\0';
    return text;
}
