#pragma once

// What else the appliance's libraries offer: flash, alerts and the table of network shares.

#include <cstddef>

extern "C" {

// Copies the saved configuration to flash; `how` is 1. Negative on failure.
int LIB_CP_Config_To_MTD(int how);

// Raises an alert that the appliance shows to its owner. Negative on failure.
int fireAlert(int level, int code, const char *text);

// Loads the share table and points `pss` at it; Free_All_List frees it.
int get_samba_info(void);
void Free_All_List(void);
extern char *pss;
}

namespace bakjob
{

// The share table by byte offsets, whatever the width of a pointer: a pointer to the next record is not
// aligned for one of 8 bytes. Texts end with a zero byte.
inline constexpr std::size_t SHARE_TABLE_FIRST = 49016; // in the table: pointer to the first record, or null
inline constexpr std::size_t SHARE_NAME = 516;          // in a record: text
inline constexpr std::size_t SHARE_PATH = 2052;         // in a record: text
inline constexpr std::size_t SHARE_NEXT = 55348;        // in a record: pointer to the next one, or null

} // namespace bakjob
