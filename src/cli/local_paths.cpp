#include "cli/local_paths.h"

#include "common/handles.h"
#include "common/job_files.h"
#include "common/private_file.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"

#include <cstdio>
#include <optional>

namespace bakjob
{

namespace
{

constexpr const char *SHARED_NAMES = "/etc/shared_name";
constexpr std::size_t MAX_NAME = 63;

// The first line that holds the text. Of a line only so many bytes are looked at; the rest is another line.
std::optional<std::string> line_holding(std::string_view text, std::size_t line_length)
{
    const UniqueFile file(std::fopen(SHARED_NAMES, "re"));
    if (!file) return std::nullopt;
    std::string line(line_length + 1, '\0');
    while (std::fgets(line.data(), static_cast<int>(line.size()), file.get()) != nullptr) {
        const std::string_view read = line.c_str();
        if (contains(read, text)) return std::string(read);
    }
    return std::nullopt;
}

// Between the third "/" and the next.
std::string_view third_component(std::string_view path)
{
    for (int slash = 0; slash < 3; ++slash) {
        const std::size_t at = path.find('/');
        if (at == std::string_view::npos) return {};
        path.remove_prefix(at + 1);
    }
    return path.substr(0, path.find('/'));
}

} // namespace

int rsync_make_dir(const std::string &path)
{
    if (path.empty()) return -1;
    const auto escaped = shell_path("folder", path);
    return escaped ? run_shell("mkdir -m 777 -p " + *escaped) : -1;
}

int rsync_is_dir(const std::string &path)
{
    return is_directory(path) ? 1 : 0;
}

int rsync_volume_is_shared(const std::string &path)
{
    const std::string_view component = third_component(path);
    if (path.size() >= PATH_SIZE || component.empty()) return 0;
    return line_holding(component, 1023) ? 1 : 0;
}

const char *rsync_shared_path(const std::string &path)
{
    static char result[PATH_SIZE];
    result[0] = '\0';
    const std::size_t prefix = VOLUMES_FOLDER.size() + VOLUME_LENGTH;
    if (!path.starts_with(VOLUMES_FOLDER) || path.size() < prefix) return result;
    const auto line = line_holding(path.substr(VOLUMES_FOLDER.size(), VOLUME_LENGTH), 127);
    const std::string name = line ? shared_name_of_line(*line) : "";
    if (name.empty()) return result;
    const std::string below = path.size() > prefix ? path.substr(prefix + 1) : "";
    copy_text(result, '/' + name + '/' + below);
    return result;
}

std::string shared_name_of_line(std::string_view line)
{
    const std::string_view word = next_word(line);
    return word.size() > MAX_NAME ? std::string() : std::string(word);
}

} // namespace bakjob
