#pragma once

// Where the appliance keeps its configuration.

namespace device
{

inline constexpr const char *STORE_FILE = "/etc/NAS_CFG/config.xml";
inline constexpr const char *FLASH_FOLDER = "/var/lib/device_flash";
inline constexpr const char *FLASH_FILE = "/var/lib/device_flash/config.xml";

} // namespace device
