#pragma once

// What the other stand-ins need of the configuration store beyond src/platform/config_store.h.

#include <optional>
#include <string>

namespace device
{

// The whole text at `path`, however long; none when there is no such node.
std::optional<std::string> store_text(const std::string &path);

// Whether flash holds a configuration that could take the file's place. One that cannot be read may still be
// all that is left.
enum class FlashCopy { NONE, GOOD, UNREADABLE };
FlashCopy flash_copy();

// False while the store's file is damaged: what reads as missing then may well be there.
bool store_usable();

} // namespace device
