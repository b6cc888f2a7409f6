#pragma once

// The appliance's scheduler. Its entries live in the configuration store under "/system_mgr/crond", in
// groups; each names a command and, in cron's notation, when it runs.

extern "C" {

// Adds an entry to `group`, which is made when missing. Negative on failure.
int LIB_create_xml(const char *minute, const char *hour, const char *day, const char *month,
                   const char *weekday, const char *user, const char *run, const char *group);

// Deletes `group` with all its entries. Negative when there is no such group.
int LIB_do_delete_xml(const char *group);

// Makes the scheduler take over what the store now says. Negative on failure.
int LIB_do_ctc(void);
}
