#include "transfer_figures.h"

#include "common/handles.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <optional>
#include <string_view>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

struct Figures {
    std::uint64_t files = 0;
    std::uint64_t bytes = 0;
};

// The number that follows `label` in a line, if it is there.
std::optional<std::uint64_t> number_behind(std::string_view line, std::string_view label)
{
    const std::size_t place = line.find(label);
    if (place == std::string_view::npos) return std::nullopt;
    line.remove_prefix(place + label.size());
    line.remove_prefix(std::min(line.find_first_not_of(' '), line.size()));
    std::uint64_t number = 0;
    const auto [end, error] = std::from_chars(line.data(), line.data() + line.size(), number);
    return error == std::errc() ? std::optional(number) : std::nullopt;
}

// A line of "--stats".
void take_statistics(std::string_view line, Figures &figures)
{
    figures.files = number_behind(line, "Number of regular files transferred:").value_or(figures.files);
    figures.bytes = number_behind(line, "Total transferred file size:").value_or(figures.bytes);
}

// A line of "--info=progress2": bytes, per cent, speed, time and, behind a whole file, "(xfr#N, ...)".
void take_progress(std::string_view line, Figures &figures)
{
    if (line.find('%') == std::string_view::npos) return;
    figures.bytes = number_behind(line, "").value_or(figures.bytes);
    figures.files = number_behind(line, "xfr#").value_or(figures.files);
}

// Made anew, as others may write to its folder, and then overwritten in place by lines of one length: whoever
// reads it finds a whole one.
class FiguresFile
{
public:
    explicit FiguresFile(const std::string &path)
    {
        std::remove(path.c_str());
        fd_ =
            bakjob::UniqueFd(open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
    }

    void write(const Figures &figures) const
    {
        std::array<char, 64> line{};
        const int length = std::snprintf(line.data(), line.size(), "%20llu %20llu\n",
                                         static_cast<unsigned long long>(figures.files),
                                         static_cast<unsigned long long>(figures.bytes));
        if (pwrite(fd_.get(), line.data(), static_cast<std::size_t>(length), 0) < 0)
            return; // tries again soon
    }

private:
    bakjob::UniqueFd fd_;
};

// The figures are what stands in the output that a job's "-q" would suppress.
void make_talk(std::vector<std::string> &arguments, bool dry_run)
{
    std::erase(arguments, "-q");
    for (std::string &argument : arguments) {
        const bool letters = argument.size() > 1 && argument[0] == '-' && argument[1] != '-';
        const std::size_t q = letters ? argument.find('q') : std::string::npos;
        if (q < argument.find_first_of("efBTM@")) argument.erase(q, 1); // letters that take what follows
    }
    const char *const output = dry_run ? "--stats" : "--info=progress2";
    arguments.insert(arguments.begin() + 1, {"--no-human-readable", output});
}

// Reads until the end of the output; every call of `take` gets a line.
template <class Take, class Pause>
void read_lines(int fd, const Take &take, const Pause &pause)
{
    std::array<char, 4096> piece{};
    std::string rest;
    for (ssize_t count = 0; (count = read(fd, piece.data(), piece.size())) > 0;) {
        rest.append(piece.data(), static_cast<std::size_t>(count));
        for (std::size_t end = 0; (end = rest.find_first_of("\r\n")) != std::string::npos;) {
            take(std::string_view(rest).substr(0, end));
            rest.erase(0, end + 1);
        }
        if (rest.size() > piece.size()) rest.clear(); // no line of ours is as long
        pause();
    }
}

[[noreturn]] void become_child(const StockProgram &rsync, const std::vector<std::string> &arguments,
                               int output)
{
    prctl(PR_SET_PDEATHSIG, SIGTERM);
    dup2(output, STDOUT_FILENO);
    std::exit(become_stock(rsync, arguments));
}

} // namespace

int run_with_figures(const StockProgram &rsync, const std::string &job_name,
                     std::vector<std::string> arguments)
{
    const bool dry_run = std::count(arguments.begin(), arguments.end(), "--dry-run") > 0;
    make_talk(arguments, dry_run);
    std::array<int, 2> ends{};
    if (pipe2(ends.data(), O_CLOEXEC) < 0) return become_stock(rsync, arguments);
    const pid_t child = fork();
    if (child < 0) return become_stock(rsync, arguments);
    if (child == 0) become_child(rsync, arguments, ends[1]);
    close(ends[1]);

    const std::string path = "/tmp/r_" + job_name;
    Figures figures;
    if (dry_run) {
        read_lines(
            ends[0], [&](std::string_view line) { take_statistics(line, figures); }, [] {});
        FiguresFile(path + ".dump_size").write(figures);
    } else {
        const FiguresFile file(path);
        const auto publish = [&] { file.write(figures); };
        read_lines(
            ends[0], [&](std::string_view line) { take_progress(line, figures); }, publish);
        publish();
    }

    int status = 0;
    if (waitpid(child, &status, 0) != child) return EXIT_FAILURE;
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}
