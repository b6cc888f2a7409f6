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

inline void store_decimal(const std::string &path, int value)
{
    xml_set_str(path.c_str(), std::to_string(value).c_str());
}

} // namespace bakjob
