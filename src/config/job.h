#pragma once

// One backup job as it stands in memory: a flat record whose fields carry the names of the job's keys in the
// configuration store. Texts always hold a terminated string and never more than their size.

#include "common/job_name.h"
#include "common/password.h"
#include "common/refusal.h"

#include <climits>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace bakjob
{

inline constexpr const char *DEFAULT_PORT = "873";
inline constexpr const char *DEFAULT_USER = "root"; // over there
inline constexpr int MAX_PORT = 65535;

enum ServerType : std::int32_t { SERVER_SAME_KIND = 1, SERVER_ANY = 2 };
enum BackupType : std::int32_t { BACKUP_PUSH = 1, BACKUP_PULL = 2 };
enum ScheduleMode : std::int32_t { SCHEDULE_TIMETABLE = 1, SCHEDULE_ONCE = 2, SCHEDULE_EVENT = 3 };
enum RsyncMode : std::int32_t { RSYNC_MODE_SHELL = 1, RSYNC_MODE_DAEMON = 2 };

// What becomes of files that the receiving side has already. Any other number mirrors, too.
enum ExistingFiles : std::int32_t {
    EXISTING_MIRROR = 0, // updated, and deleted when the sending side does not have them
    EXISTING_KEEP = 1,   // left alone
    EXISTING_UPDATE = 2  // updated; nothing is deleted
};

// Texts of a job that are too long for their fields, whole, by key.
using WholeTexts = std::map<std::string, std::string, std::less<>>;

struct RsyncJob {
    std::int32_t enable;
    std::int32_t state;
    std::int32_t pwd_encoded; // not 0: rsync_pwd, and ssh_pwd of an ssh job, hold base64 text
    std::int32_t server_type;
    std::int32_t backup_type;
    std::int32_t rsync_mode;
    std::int32_t schedule_mode;
    std::int32_t use_ssh;
    std::int32_t keep_exist_file;
    std::int32_t inc_enable;
    std::int32_t inc_number;
    std::int32_t retry;          // attempts
    std::int32_t retry_interval; // seconds
    std::int32_t rsync_timeout;  // seconds, 0 for none
    char last_do_job_time[32];
    char job_name[JOB_NAME_SIZE];
    char rsync_user[128];
    char rsync_pwd[PASSWORD_SIZE];
    char ssh_user[128];
    char ssh_pwd[PASSWORD_SIZE];
    char port[16];
    char remote_ip[260];
    char remote_path[1024];
    char local_path[2600]; // source folders, separated by ":"
    char rsync_pwd_file[1024];
    char user_description[128];
    std::int32_t rstate;
    char rlast_do_job_time[32];
    char in_remote_cloud_fqdn[32];
    RsyncJob *next;
    std::shared_ptr<const WholeTexts> whole_texts; // null: every text is whole
};

// One field of the record, in the order in which the store keeps the keys.
struct JobField {
    const char *key;
    std::size_t offset;
    std::size_t size;     // bytes of a text, terminator included; 0: an integer
    int lowest = INT_MIN; // lowest..highest is what an integer is meant to hold
    int highest = INT_MAX;
    std::optional<int> otherwise = std::nullopt; // what another integer is loaded as; nullopt: as it is
    bool in_commands = false;                    // a text that becomes part of a command or names a file

    [[nodiscard]] bool is_text() const { return size != 0; }
    [[nodiscard]] bool in_range(int value) const { return value >= lowest && value <= highest; }
};

std::span<const JobField> job_fields();

// The field of a key, which must exist.
const JobField &job_field(std::string_view key);

std::int32_t &integer_field(RsyncJob &job, const JobField &field);
char *text_field(RsyncJob &job, const JobField &field);
const std::int32_t &integer_field(const RsyncJob &job, const JobField &field);
const char *text_field(const RsyncJob &job, const JobField &field);

// Refuses a job with a cut text that commands need; empty for any other.
Refusal refusal_of_cut_text(const RsyncJob &job);

// The text of that key as it is in the store, when the field has only its start; else null.
const std::string *whole_text_of(const RsyncJob &job, std::string_view key);

inline bool was_cut(const RsyncJob &job, std::string_view key)
{
    return whole_text_of(job, key) != nullptr;
}

// To be called when the field has got another text.
void forget_whole_text(RsyncJob &job, std::string_view key);

// Copies every field but `next`.
void rsync_copy_job(RsyncJob &destination, const RsyncJob &source);

// Snapshots that an incremental job keeps: its `inc_number` brought within MIN_SNAPSHOTS to MAX_SNAPSHOTS.
int snapshots_kept(int inc_number);

} // namespace bakjob
