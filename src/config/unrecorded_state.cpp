#include "config/unrecorded_state.h"

#include "common/job_files.h"
#include "common/private_file.h"
#include "common/text.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <fcntl.h>
#include <unistd.h>

namespace bakjob
{

namespace
{

constexpr std::array KINDS = {StateKind::BACKUP, StateKind::RESTORE};

// A line of the file: "state 4 Sun Nov 22 2026 10:15:00 PM".
std::string_view key_of(StateKind kind)
{
    return kind == StateKind::BACKUP ? "state" : "rstate";
}

std::string line_of(StateKind kind, const UnrecordedState &state)
{
    return std::string(key_of(kind)) + ' ' + std::to_string(state.state) + ' ' + state.time + '\n';
}

std::string contents_of(const std::string &path)
{
    const UniqueFd file = open_own_file(path, O_RDONLY);
    char text[512];
    const ssize_t length = file ? read(file.get(), text, sizeof text) : 0;
    return {text, length > 0 ? static_cast<std::size_t>(length) : 0};
}

} // namespace

bool rsync_keep_unrecorded(const JobName &job, StateKind kind, const UnrecordedState &state)
{
    std::string contents;
    for (const StateKind each : KINDS) {
        const auto kept = each == kind ? state : rsync_unrecorded_state(job, each);
        if (kept) contents += line_of(each, *kept);
    }
    return replace_file(unrecorded_file(job), 0600, contents);
}

std::optional<UnrecordedState> rsync_unrecorded_state(const JobName &job, StateKind kind)
{
    const std::string contents = contents_of(unrecorded_file(job));
    std::string_view rest = contents;
    while (!rest.empty()) {
        std::string_view line = rest.substr(0, rest.find('\n'));
        rest.remove_prefix(std::min(rest.size(), line.size() + 1));
        if (next_word(line) != key_of(kind)) continue;
        const auto state = whole_number<std::int32_t>(next_word(line));
        if (!state) continue;
        line.remove_prefix(std::min(line.size(), line.find_first_not_of(' ')));
        return UnrecordedState{*state, std::string(line)};
    }
    return std::nullopt;
}

void rsync_forget_unrecorded(const JobName &job, StateKind kind)
{
    const std::string path = unrecorded_file(job);
    if (access(path.c_str(), F_OK) != 0) return;
    for (const StateKind other : KINDS) {
        const auto kept = other == kind ? std::nullopt : rsync_unrecorded_state(job, other);
        if (kept && replace_file(path, 0600, line_of(other, *kept))) return;
    }
    unlink(path.c_str());
}

void rsync_forget_unrecorded(const JobName &job)
{
    unlink(unrecorded_file(job).c_str());
}

void rsync_rename_unrecorded(const JobName &job, const JobName &new_name)
{
    if (std::rename(unrecorded_file(job).c_str(), unrecorded_file(new_name).c_str()) == 0) return;
    rsync_forget_unrecorded(new_name);
    rsync_forget_unrecorded(job);
}

} // namespace bakjob
