#include "config/job.h"

#include "common/job_files.h"
#include "common/text.h"

#include <algorithm>
#include <array>
#include <type_traits>

namespace bakjob
{

namespace
{

static_assert(std::is_standard_layout_v<RsyncJob>, "fields are found by their offsets");

#define INTEGER(name) .key = #name, .offset = offsetof(RsyncJob, name), .size = 0
#define TEXT(name) .key = #name, .offset = offsetof(RsyncJob, name), .size = sizeof(RsyncJob::name)

constexpr std::array FIELDS = {
    JobField{INTEGER(enable), .lowest = 0, .highest = 1},
    JobField{INTEGER(state)},
    JobField{INTEGER(pwd_encoded)},
    JobField{INTEGER(server_type), .lowest = SERVER_SAME_KIND, .highest = SERVER_ANY},
    JobField{INTEGER(backup_type), .lowest = BACKUP_PUSH, .highest = BACKUP_PULL},
    JobField{INTEGER(rsync_mode), .lowest = RSYNC_MODE_SHELL, .highest = RSYNC_MODE_DAEMON},
    JobField{INTEGER(schedule_mode), .lowest = SCHEDULE_TIMETABLE, .highest = SCHEDULE_EVENT},
    JobField{INTEGER(use_ssh), .lowest = 0, .highest = 1},
    JobField{INTEGER(keep_exist_file), .lowest = EXISTING_MIRROR, .highest = EXISTING_UPDATE},
    JobField{INTEGER(inc_enable), .lowest = 0, .highest = 1},
    JobField{INTEGER(inc_number), .lowest = MIN_SNAPSHOTS, .highest = MAX_SNAPSHOTS},
    JobField{INTEGER(retry), .lowest = 0, .highest = 15, .otherwise = 0},
    JobField{INTEGER(retry_interval), .lowest = 1, .highest = 180, .otherwise = 30},
    JobField{INTEGER(rsync_timeout), .lowest = 0, .highest = INT_MAX, .otherwise = 600},
    JobField{TEXT(last_do_job_time)},
    JobField{TEXT(job_name), .in_commands = true},
    JobField{TEXT(rsync_user), .in_commands = true},
    JobField{TEXT(rsync_pwd), .in_commands = true},
    JobField{TEXT(ssh_user), .in_commands = true},
    JobField{TEXT(ssh_pwd), .in_commands = true},
    JobField{TEXT(port), .in_commands = true},
    JobField{TEXT(remote_ip), .in_commands = true},
    JobField{TEXT(remote_path), .in_commands = true},
    JobField{TEXT(local_path)},
    JobField{TEXT(rsync_pwd_file), .in_commands = true},
    JobField{TEXT(user_description)},
    JobField{INTEGER(rstate)},
    JobField{TEXT(rlast_do_job_time)},
    JobField{TEXT(in_remote_cloud_fqdn)},
};

#undef INTEGER
#undef TEXT

} // namespace

std::span<const JobField> job_fields()
{
    return FIELDS;
}

const JobField &job_field(std::string_view key)
{
    return *std::find_if(FIELDS.begin(), FIELDS.end(),
                         [&](const JobField &field) { return field.key == key; });
}

std::int32_t &integer_field(RsyncJob &job, const JobField &field)
{
    return *reinterpret_cast<std::int32_t *>(reinterpret_cast<char *>(&job) + field.offset);
}

char *text_field(RsyncJob &job, const JobField &field)
{
    return reinterpret_cast<char *>(&job) + field.offset;
}

const std::int32_t &integer_field(const RsyncJob &job, const JobField &field)
{
    return integer_field(const_cast<RsyncJob &>(job), field);
}

const char *text_field(const RsyncJob &job, const JobField &field)
{
    return text_field(const_cast<RsyncJob &>(job), field);
}

Refusal refusal_of_cut_text(const RsyncJob &job)
{
    for (const JobField &field : FIELDS) {
        if (field.in_commands && was_cut(job, field.key)) return refused(field.key, "too long");
    }
    return {};
}

const std::string *whole_text_of(const RsyncJob &job, std::string_view key)
{
    if (!job.whole_texts) return nullptr;
    const auto found = job.whole_texts->find(key);
    return found == job.whole_texts->end() ? nullptr : &found->second;
}

void forget_whole_text(RsyncJob &job, std::string_view key)
{
    if (!was_cut(job, key)) return;
    WholeTexts rest = *job.whole_texts;
    rest.erase(rest.find(key));
    job.whole_texts = std::make_shared<const WholeTexts>(std::move(rest));
}

void rsync_copy_job(RsyncJob &destination, const RsyncJob &source)
{
    for (const JobField &field : FIELDS) {
        if (!field.is_text()) {
            integer_field(destination, field) = integer_field(source, field);
        } else {
            copy_text(text_field(destination, field), field.size, text_field(source, field));
        }
    }
    destination.whole_texts = source.whole_texts;
}

int snapshots_kept(int inc_number)
{
    return std::clamp(inc_number, MIN_SNAPSHOTS, MAX_SNAPSHOTS);
}

} // namespace bakjob
