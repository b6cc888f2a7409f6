#pragma once

// The keys of a job as people set and read them: what each may hold, and what its numbers mean.

#include "config/job.h"

#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace bakjob::ctl
{

struct Choice {
    int value;
    const char *word; // may be given instead of the number
};

enum class FieldKind {
    PLAIN,
    SECRET, // never shown, and never taken from the command line
    OWN     // bakjob's own: shown, never set
};

struct FieldRule {
    const char *key;
    FieldKind kind;
    const char *meaning;
    std::vector<Choice> choices{};                         // a number's words; empty: it has none
    bool (*text_passes)(std::string_view value) = nullptr; // a text's test beyond its length
    std::string allowed{};                                 // what may be given, in words
};

// In the order in which the store keeps the keys.
const std::vector<FieldRule> &field_rules();

struct Setting {
    const FieldRule *rule;
    std::string value;
};

// Takes "key=value" apart and checks it. Secrets are asked for by `ask`, which is given the key. Failure
// names the key, what was given and what is allowed.
std::vector<Setting> parse_settings(const std::vector<std::string> &texts,
                                    const std::function<std::string(const std::string &key)> &ask);

// Passwords become base64, unless the job has plain ones.
void apply_settings(RsyncJob &job, const std::vector<Setting> &settings);

// A job that pushes to a daemon's module and deletes nothing there.
RsyncJob job_with_defaults(const std::string &name);

// The value for people: numbers with their word, secrets only whether there are any.
std::string shown_value(const RsyncJob &job, const JobField &field);

bool is_secret(const JobField &field);

// Why bakjobctl would refuse to set this value; empty when it would not. Secrets are not checked.
std::string refusal_of(const RsyncJob &job, const JobField &field);

// The word of a number; empty when it has none.
std::string word_of(std::string_view key, int value);

} // namespace bakjob::ctl
