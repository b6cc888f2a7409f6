#pragma once

// What the other stand-ins need of the configuration store beyond src/platform/config_store.h.

#include <optional>
#include <string>

namespace device
{

// The whole text at `path`, however long; nullopt when there is no such node.
std::optional<std::string> store_text(const std::string &path);

// Whether flash holds a configuration that could replace the file. A copy that cannot be read may still be
// all that is left.
enum class FlashCopy { NONE, GOOD, UNREADABLE };
FlashCopy flash_copy();

// False while the store's file is damaged: a node that reads as missing may then be there.
bool store_usable();

} // namespace device
