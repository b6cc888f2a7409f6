// ps: every process with its whole command line, one a line, the process id first. Arguments are taken and
// ignored: there is no other output.

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstdlib>
#include <dirent.h>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace
{

struct CloseFolder {
    void operator()(DIR *folder) const { closedir(folder); }
};
struct CloseFile {
    void operator()(std::FILE *file) const { std::fclose(file); }
};

std::vector<long> process_ids()
{
    std::vector<long> ids;
    const std::unique_ptr<DIR, CloseFolder> folder(opendir("/proc"));
    while (const dirent *entry = folder ? readdir(folder.get()) : nullptr) {
        const long id = std::strtol(entry->d_name, nullptr, 10);
        if (id > 0) ids.push_back(id);
    }
    std::sort(ids.begin(), ids.end());
    return ids;
}

std::optional<std::string> read_process_file(long id, const char *name)
{
    const std::string path = "/proc/" + std::to_string(id) + "/" + name;
    const std::unique_ptr<std::FILE, CloseFile> file(std::fopen(path.c_str(), "re"));
    if (!file) return std::nullopt;
    std::string text;
    char piece[4096];
    while (const std::size_t count = std::fread(piece, 1, sizeof piece, file.get())) {
        text.append(piece, count);
    }
    return text;
}

// None for a process that is gone by now.
std::optional<std::string> command_line(long id)
{
    auto line = read_process_file(id, "cmdline");
    if (!line) return std::nullopt;
    while (!line->empty() && line->back() == '\0') {
        line->pop_back();
    }
    if (line->empty()) {
        auto name = read_process_file(id, "comm");
        if (!name) return std::nullopt;
        while (name->ends_with('\n')) {
            name->pop_back();
        }
        line->append("[").append(*name).append("]");
    }
    const auto breaks_line = [](char c) { return c == '\0' || c == '\n' || c == '\r'; };
    std::replace_if(line->begin(), line->end(), breaks_line, ' ');
    return line;
}

} // namespace

int main()
{
    std::puts("    PID COMMAND");
    for (const long id : process_ids()) {
        if (const auto line = command_line(id)) std::printf("%7ld %s\n", id, line->c_str());
    }
    return std::fflush(stdout) == 0 ? EXIT_SUCCESS : EXIT_FAILURE;
}
