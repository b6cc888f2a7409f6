#pragma once

// Reading and writing values of the configuration store with composed paths.

#include "common/text.h"
#include "platform/config_store.h"

#include <string>

namespace bakjob
{

// The text at `path`, at most `size` - 1 bytes of it; empty when there is none.
inline std::string store_text(const std::string &path, std::size_t size)
{
    std::string text(size, '\0');
    xml_get_str(path.c_str(), static_cast<int>(size), text.data());
    text.resize(text.find('\0'));
    return text;
}

// Whether there is a node at `path`: only then is the buffer written to.
inline bool store_has(const std::string &path)
{
    constexpr char UNTOUCHED = '\1';
    char start[2] = {UNTOUCHED, '\0'};
    xml_get_str(path.c_str(), sizeof start, start);
    return start[0] != UNTOUCHED;
}

// Bytes, terminator included, of the longest text that is read whole.
inline constexpr std::size_t MAX_TEXT_SIZE = 1U << 20U;

// The text at `path` however long it is; of one that is_cut only the start.
inline std::string whole_text(const std::string &path)
{
    std::string text;
    std::size_t size = 4096;
    do {
        size *= 4;
        text = store_text(path, size);
    } while (text.size() == size - 1 && size < MAX_TEXT_SIZE);
    return text;
}

// Whether a text from whole_text may be longer in the store.
inline bool is_cut(const std::string &text)
{
    return text.size() >= MAX_TEXT_SIZE - 1;
}

// Whether the store took the text.
inline bool set_store_text(const std::string &path, const std::string &text)
{
    return xml_set_str(path.c_str(), text.c_str()) >= 0;
}

inline bool set_store_decimal(const std::string &path, int value)
{
    return set_store_text(path, std::to_string(value));
}

} // namespace bakjob
