#include "common/processes.h"

#include "common/text.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <dirent.h>
#include <fstream>
#include <memory>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <system_error>

namespace bakjob
{

namespace
{

struct CloseFolder {
    void operator()(DIR *folder) const { closedir(folder); }
};

std::string proc_file(pid_t process, const char *name)
{
    return "/proc/" + std::to_string(process) + '/' + name;
}

// The fields behind the name, which stands in parentheses and may hold some itself.
std::optional<Process> read_process(pid_t id)
{
    std::ifstream file(proc_file(id, "stat"));
    std::string line;
    if (!std::getline(file, line, '\0')) return std::nullopt;
    const std::size_t name_end = line.rfind(')');
    if (name_end == std::string::npos) return std::nullopt;
    Process process{.id = id, .parent = 0, .started = 0};
    char state = 0;
    const int fields =
        std::sscanf(line.c_str() + name_end + 1, // NOLINT(cert-err34-c): the kernel's own numbers
                    " %c %d %*d %*d %*d %*d %*u %*u %*u %*u %*u %*u %*u %*d %*d %*d %*d %*d "
                    "%*d %llu",
                    &state, &process.parent, &process.started);
    if (fields != 3 || state == 'Z' || state == 'X') return std::nullopt;
    return process;
}

// Real, effective, saved and file-system user. A program with the setuid bit has its caller's as the first.
bool is_roots(pid_t process)
{
    std::ifstream file(proc_file(process, "status"));
    for (std::string line; std::getline(file, line);) {
        if (line.starts_with("Uid:")) return line == "Uid:\t0\t0\t0\t0";
    }
    return false;
}

bool sees_our_ids(pid_t process)
{
    struct stat ours = {};
    struct stat its = {};
    if (stat("/proc/self/ns/pid", &ours) != 0) return true; // a kernel without namespaces
    return stat(proc_file(process, "ns/pid").c_str(), &its) == 0 && its.st_ino == ours.st_ino &&
           its.st_dev == ours.st_dev;
}

} // namespace

std::vector<Process> running_processes()
{
    const std::unique_ptr<DIR, CloseFolder> folder(opendir("/proc"));
    if (!folder) throw std::system_error(errno, std::generic_category(), "/proc");
    std::vector<Process> all;
    while (const dirent *const entry = readdir(folder.get())) {
        const auto id = whole_number<pid_t>(entry->d_name);
        const auto process = id ? read_process(*id) : std::nullopt;
        if (process) all.push_back(*process);
    }
    return all;
}

bool is_running(pid_t process)
{
    return read_process(process).has_value();
}

void add_descendants(std::vector<Process> &family, const std::vector<Process> &all)
{
    for (std::size_t i = 0; i < family.size(); ++i) { // which grows meanwhile
        for (const Process &process : all) {
            if (process.parent != family[i].id) continue;
            if (std::find(family.begin(), family.end(), process) == family.end()) family.push_back(process);
        }
    }
}

bool is_roots_with_entry(pid_t process, std::string_view entry)
{
    if (!is_roots(process) || !sees_our_ids(process)) return false;
    std::ifstream file(proc_file(process, "environ"), std::ios::binary);
    for (std::string one; std::getline(file, one, '\0');) {
        if (one == entry) return true;
    }
    return false;
}

} // namespace bakjob
