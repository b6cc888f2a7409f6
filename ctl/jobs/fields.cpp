#include "jobs/fields.h"

#include "common/folder_table.h"
#include "common/job_files.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "output/failure.h"

#include <algorithm>

namespace bakjob::ctl
{

namespace
{

bool has_no_control(std::string_view text)
{
    return !holds_control(text);
}

bool is_host(std::string_view text)
{
    return !text.empty() && !refusal_of_host(text);
}

// A run accepts blanks behind the number.
bool is_port(std::string_view text)
{
    return whole_number(text.substr(0, text.find_last_not_of(' ') + 1), 1, MAX_PORT).has_value();
}

bool is_remote_path(std::string_view text)
{
    return !text.empty() && shell_path_part("remote_path", text);
}

bool is_folder(std::string_view folder)
{
    return folder.starts_with('/') && folder.size() < FolderTable::WIDTH &&
           !contains(std::string(folder) + '/', "/../") && shell_path("local_path", folder);
}

bool is_folder_list(std::string_view text)
{
    int folders = 0;
    while (true) {
        const std::size_t length = std::min(text.find(':'), text.size());
        if (++folders > FolderTable::SIZE || !is_folder(text.substr(0, length))) return false;
        if (length == text.size()) return true;
        text.remove_prefix(length + 1);
    }
}

constexpr const char *NAME_RULE = "not empty, no blank, nothing that a shell acts on, no dash in front";

bool is_ssh_user(std::string_view text)
{
    return !text.empty() && !refusal_of_ssh_user(text);
}

bool is_rsync_user(std::string_view text)
{
    return !text.empty() && !refusal_of_rsync_user(text);
}

bool is_password(std::string_view text)
{
    return text.size() <= MAX_ENCODED_PASSWORD && has_no_control(text);
}

const std::vector<Choice> NO_YES = {{0, "no"}, {1, "yes"}};
constexpr const char *NO_CONTROL = "no control character";

FieldRule own(const char *key, const char *meaning)
{
    return {.key = key, .kind = FieldKind::OWN, .meaning = meaning};
}

FieldRule number(const char *key, const char *meaning)
{
    const JobField &field = job_field(key);
    return {.key = key,
            .kind = FieldKind::PLAIN,
            .meaning = meaning,
            .allowed = std::to_string(field.lowest) + " to " + std::to_string(field.highest)};
}

FieldRule choice(const char *key, const char *meaning, std::vector<Choice> choices)
{
    std::string allowed;
    for (const Choice &each : choices) {
        allowed += (allowed.empty() ? "" : ", ") + std::to_string(each.value) + " (" + each.word + ")";
    }
    return {.key = key,
            .kind = FieldKind::PLAIN,
            .meaning = meaning,
            .choices = std::move(choices),
            .allowed = std::move(allowed)};
}

std::string up_to(std::size_t bytes, const std::string &rule)
{
    return "up to " + std::to_string(bytes) + " bytes, " + rule;
}

FieldRule text(const char *key, const char *meaning, bool (*passes)(std::string_view),
               const std::string &rule)
{
    return {.key = key,
            .kind = FieldKind::PLAIN,
            .meaning = meaning,
            .text_passes = passes,
            .allowed = up_to(job_field(key).size - 1, rule)};
}

FieldRule port(const char *key, const char *meaning)
{
    return {.key = key,
            .kind = FieldKind::PLAIN,
            .meaning = meaning,
            .text_passes = is_port,
            .allowed = "1 to " + std::to_string(MAX_PORT)};
}

FieldRule password(const char *key, const char *meaning)
{
    return {.key = key,
            .kind = FieldKind::SECRET,
            .meaning = meaning,
            .text_passes = is_password,
            .allowed = up_to(MAX_ENCODED_PASSWORD, NO_CONTROL)};
}

const FieldRule *find_rule(std::string_view key)
{
    for (const FieldRule &rule : field_rules()) {
        if (key == rule.key) return &rule;
    }
    return nullptr;
}

// The number that a value means for the key, if it may be given.
std::optional<int> number_of(const FieldRule &rule, const std::string &value)
{
    for (const Choice &choice : rule.choices) {
        if (value == choice.word) return choice.value;
    }
    const JobField &field = job_field(rule.key);
    return whole_number(value, field.lowest, field.highest);
}

bool is_allowed(const FieldRule &rule, const std::string &value)
{
    const JobField &field = job_field(rule.key);
    if (!field.is_text()) return number_of(rule, value).has_value();
    return value.size() < field.size && rule.text_passes(value);
}

Setting parse_setting(const std::string &text, const std::function<std::string(const std::string &key)> &ask)
{
    const std::size_t equals = text.find('=');
    if (equals == std::string::npos) throw Failure("\"" + text + "\" is not of the form key=value");
    const std::string key = text.substr(0, equals);
    std::string value = text.substr(equals + 1);
    const FieldRule *const rule = find_rule(key);
    if (rule == nullptr) throw Failure("there is no key \"" + key + "\"; bakjobctl keys lists them");
    if (rule->kind == FieldKind::OWN) throw Failure(key + " is bakjob's own and cannot be set");
    const bool secret = rule->kind == FieldKind::SECRET;
    if (secret && value == "-") {
        value = ask(key);
    } else if (secret && !value.empty()) {
        throw Failure(key + ": write " + key +
                      "=- and give the password at the prompt or on standard input: others can read a "
                      "command line");
    }
    if (is_allowed(*rule, value)) return {rule, value};
    const std::string given = secret ? "what was given" : "\"" + value + "\"";
    throw Failure(key + ": " + given + " is not allowed; allowed: " + rule->allowed);
}

void set_password(RsyncJob &job, const JobField &field, const std::string &value)
{
    // The next load encodes plain passwords, but not the ssh password of a job without ssh.
    const bool stays_plain =
        job.pwd_encoded == 0 && !(job.use_ssh != 1 && field.key == std::string("ssh_pwd"));
    if (stays_plain || value.empty()) {
        copy_text(text_field(job, field), field.size, value);
    } else {
        password_encode(text_field(job, field), value.c_str(), field.size);
    }
}

} // namespace

const std::vector<FieldRule> &field_rules()
{
    static const std::vector<FieldRule> rules = {
        choice("enable", "whether the job may run", NO_YES),
        own("state", "how the last run ended"),
        own("pwd_encoded", "whether the passwords are kept as base64 text"),
        choice("server_type", "kind of the remote side",
               {{SERVER_SAME_KIND, "appliance"}, {SERVER_ANY, "other"}}),
        choice("backup_type", "direction", {{BACKUP_PUSH, "push"}, {BACKUP_PULL, "pull"}}),
        choice("rsync_mode", "what remote_path is: a path on the host, or a daemon's module and a path in it",
               {{RSYNC_MODE_SHELL, "path"}, {RSYNC_MODE_DAEMON, "module"}}),
        choice("schedule_mode", "when the job runs",
               {{SCHEDULE_TIMETABLE, "timetable"}, {SCHEDULE_ONCE, "once"}, {SCHEDULE_EVENT, "event"}}),
        choice("use_ssh", "whether the transfer goes through ssh", NO_YES),
        choice("keep_exist_file",
               "files at the target: mirror deletes what is gone, keep leaves all as they are, update "
               "deletes nothing",
               {{EXISTING_MIRROR, "mirror"}, {EXISTING_KEEP, "keep"}, {EXISTING_UPDATE, "update"}}),
        choice("inc_enable", "whether a job that pulls keeps snapshots", NO_YES),
        number("inc_number", "how many snapshots"),
        number("retry", "attempts"),
        number("retry_interval", "seconds between attempts"),
        number("rsync_timeout", "seconds of silence that end a transfer, 0 for none"),
        own("last_do_job_time", "when the state was recorded"),
        own("job_name", "part of the folders' names on both sides, so it stays as it was added"),
        text("rsync_user", "login at the daemon", is_rsync_user, NAME_RULE),
        password("rsync_pwd", "its password, empty for the default"),
        text("ssh_user", "login at the ssh server", is_ssh_user, NAME_RULE),
        password("ssh_pwd", "its password, empty for keys"),
        port("port", "the daemon's port"),
        text("remote_ip", "address or host name", is_host, NAME_RULE),
        text("remote_path", "where the data goes to or comes from", is_remote_path,
             "a path without any of \" \\ | < > * ? and control characters"),
        text("local_path", "folders of the shares", is_folder_list,
             format_text(
                 "up to %d paths separated by ':', each from / on, below %d bytes, without .. and any of "
                 "\" \\ | < > * ? and control characters",
                 FolderTable::SIZE, FolderTable::WIDTH)),
        own("rsync_pwd_file", "file that hands the password to rsync"),
        text("user_description", "a note", has_no_control, NO_CONTROL),
        own("rstate", "how the last restore ended"),
        own("rlast_do_job_time", "when that was recorded"),
        text("in_remote_cloud_fqdn", "a name for the remote side", has_no_control, NO_CONTROL),
    };
    return rules;
}

std::vector<Setting> parse_settings(const std::vector<std::string> &texts,
                                    const std::function<std::string(const std::string &key)> &ask)
{
    std::vector<Setting> settings;
    settings.reserve(texts.size());
    for (const std::string &text : texts) {
        settings.push_back(parse_setting(text, ask));
    }
    return settings;
}

void apply_settings(RsyncJob &job, const std::vector<Setting> &settings)
{
    for (const auto &[rule, value] : settings) {
        const JobField &field = job_field(rule->key);
        if (rule->kind == FieldKind::SECRET) {
            set_password(job, field, value);
        } else if (field.is_text()) {
            copy_text(text_field(job, field), field.size, value);
        } else {
            integer_field(job, field) = number_of(*rule, value).value();
        }
        forget_whole_text(job, field.key);
    }
}

RsyncJob job_with_defaults(const std::string &name)
{
    RsyncJob job{};
    for (const JobField &field : job_fields()) {
        if (field.otherwise) integer_field(job, field) = *field.otherwise;
    }
    job.enable = 1;
    job.pwd_encoded = 1;
    job.server_type = SERVER_ANY;
    job.backup_type = BACKUP_PUSH;
    job.rsync_mode = RSYNC_MODE_DAEMON;
    job.schedule_mode = SCHEDULE_TIMETABLE;
    job.keep_exist_file = EXISTING_UPDATE;
    job.inc_number = MIN_SNAPSHOTS;
    job.retry = 3;
    copy_text(job.rsync_user, DEFAULT_USER);
    copy_text(job.ssh_user, DEFAULT_USER);
    copy_text(job.port, DEFAULT_PORT);
    if (!copy_text(job.job_name, name)) throw Failure("the name is too long");
    return job;
}

std::string word_of(std::string_view key, int value)
{
    const FieldRule *const rule = find_rule(key);
    if (rule == nullptr) return "";
    for (const Choice &choice : rule->choices) {
        if (choice.value == value) return choice.word;
    }
    return "";
}

bool is_secret(const JobField &field)
{
    return find_rule(field.key)->kind == FieldKind::SECRET;
}

std::string shown_value(const RsyncJob &job, const JobField &field)
{
    if (is_secret(field)) return *text_field(job, field) == '\0' ? "(none)" : "(set)";
    if (field.is_text()) return text_field(job, field);
    const int value = integer_field(job, field);
    const std::string word = word_of(field.key, value);
    return std::to_string(value) + (word.empty() ? "" : " (" + word + ")");
}

std::string refusal_of(const RsyncJob &job, const JobField &field)
{
    const FieldRule *const rule = find_rule(field.key);
    if (rule->kind == FieldKind::OWN || rule->kind == FieldKind::SECRET) return "";
    const std::string value =
        field.is_text() ? text_field(job, field) : std::to_string(integer_field(job, field));
    if (!was_cut(job, field.key) && is_allowed(*rule, value)) return "";
    return "\"" + value + "\" is not allowed; allowed: " + rule->allowed;
}

} // namespace bakjob::ctl
