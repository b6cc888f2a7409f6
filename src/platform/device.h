#pragma once

// What else the appliance's libraries offer: flash, alerts and the table of network shares.

extern "C" {

// Copies the saved configuration to flash; `how` is 1. Negative on failure.
int LIB_CP_Config_To_MTD(int how);

// Raises an alert that the appliance shows to its owner. Negative on failure.
int fireAlert(int level, int code, const char *text);

// Loads the share table and points `pss` at it; Free_All_List frees it. The table is a block of bytes whose
// layout the share library promises by offset: see the reader in cli/source_folders.
int get_samba_info(void);
void Free_All_List(void);
extern char *pss;
}
