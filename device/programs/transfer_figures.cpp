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

constexpr std::uint64_t MOST_LISTED = 1'500'000;
constexpr const char *WHOLE_LIST = "--no-inc-recursive";
constexpr const char *LIST_IN_PIECES = "--inc-recursive";

struct Figures {
    std::uint64_t files = 0; // moved whole
    std::uint64_t bytes = 0; // of those
    std::uint64_t bytes_of_current = 0;
    std::uint64_t passed = 0;  // of the list
    std::uint64_t reached = 0; // the same in hundredths, with the share of the current one
    std::uint64_t all = 0;     // in the list; 0 while that is not known
    std::uint64_t listed = 0;  // while the list is made
};

// The number at the start of `text`, which is moved behind it.
std::optional<std::uint64_t> take_number(std::string_view &text)
{
    text.remove_prefix(std::min(text.find_first_not_of(' '), text.size()));
    std::uint64_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc()) return std::nullopt;
    text.remove_prefix(static_cast<std::size_t>(end - text.data()));
    return number;
}

std::optional<std::uint64_t> number_behind(std::string_view line, std::string_view label)
{
    const std::size_t place = line.find(label);
    if (place == std::string_view::npos) return std::nullopt;
    line.remove_prefix(place + label.size());
    return take_number(line);
}

// A line of "--info=flist2": "N files..." or, once it is whole, "N files to consider", behind other words.
void take_list_line(std::string_view line, Figures &figures)
{
    const std::size_t unit = line.rfind(" file");
    if (unit == std::string_view::npos) return;
    std::string_view words = line.substr(0, unit);
    words.remove_prefix(words.rfind(' ') + 1); // the last one, or all
    const auto number = take_number(words);
    if (!number) return;
    if (line.ends_with("to consider")) figures.all = *number;
    if (line.ends_with("...")) figures.listed = *number;
}

// "to-chk=LEFT/ALL"; while the list grows, it is called otherwise.
void take_place(std::string_view line, Figures &figures)
{
    constexpr std::string_view LABEL = "to-chk=";
    const std::size_t label = line.find(LABEL);
    if (label == std::string_view::npos) return;
    line.remove_prefix(label + LABEL.size());
    const auto left = take_number(line);
    const auto all = number_behind(line, "/");
    if (!left || !all || *left > *all) return;
    figures.all = *all;
    figures.passed = *all - *left;
}

// A line of "--info=progress": bytes of a file, per cent, speed, time and, when it is whole, "(xfr#N,
// to-chk=M/ALL)".
void take_progress_line(std::string_view line, Figures &figures)
{
    const std::string_view whole = line;
    const auto bytes = take_number(line);
    const auto share = take_number(line);
    if (!bytes || !share || !line.starts_with('%')) return take_list_line(whole, figures);
    const auto files = number_behind(line, "xfr#");
    figures.bytes_of_current = files ? 0 : *bytes;
    if (files) {
        figures.files = *files;
        figures.bytes += *bytes;
        take_place(line, figures);
    }
    // rsync goes back for files that changed while they were moved.
    const std::uint64_t reached = figures.passed * 100 + (files ? 0 : *share);
    figures.reached = std::max(figures.reached, std::min(reached, figures.all * 100));
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

    void write(const std::string &text) const
    {
        if (pwrite(fd_.get(), text.data(), text.size(), 0) < 0) return; // tries again soon
    }

private:
    bakjob::UniqueFd fd_;
};

std::string line_of(std::uint64_t first, std::uint64_t second)
{
    std::array<char, 64> line{};
    const int length =
        std::snprintf(line.data(), line.size(), "%20llu %20llu\n", static_cast<unsigned long long>(first),
                      static_cast<unsigned long long>(second));
    return {line.data(), static_cast<std::size_t>(length)};
}

std::string moved_line(const Figures &figures)
{
    return line_of(figures.files, figures.bytes + figures.bytes_of_current);
}

// In hundredths of a file, so that a large one does not seem to stand still.
std::string reached_line(const Figures &figures)
{
    return line_of(figures.reached, figures.all * 100);
}

std::string total_path(const std::string &job_name)
{
    return "/tmp/r_" + job_name + ".dump_size";
}

std::uint64_t most_listed()
{
    const char *const text = std::getenv("DEVICE_MOST_LISTED");
    const std::uint64_t most = text == nullptr ? 0 : std::strtoull(text, nullptr, 10);
    return most > 0 ? most : MOST_LISTED;
}

// The figures are what stands in the output that a job's "-q" would suppress.
void make_talk(std::vector<std::string> &arguments)
{
    std::erase(arguments, "-q");
    for (std::string &argument : arguments) {
        const bool letters = argument.size() > 1 && argument[0] == '-' && argument[1] != '-';
        const std::size_t q = letters ? argument.find('q') : std::string::npos;
        if (q < argument.find_first_of("efBTM@")) argument.erase(q, 1); // letters that take what follows
    }
    arguments.insert(arguments.begin() + 1, {"--no-human-readable", "--info=flist2,progress"});
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

int wait_for(pid_t child)
{
    int status = 0;
    if (waitpid(child, &status, 0) != child) return EXIT_FAILURE;
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

// Its exit status; nullopt when its list was becoming too long. It has moved nothing then.
std::optional<int> run_once(const StockProgram &rsync, const std::vector<std::string> &arguments,
                            std::uint64_t most, Figures &figures, const FiguresFile &file)
{
    std::array<int, 2> ends{};
    if (pipe2(ends.data(), O_CLOEXEC) < 0) return become_stock(rsync, arguments);
    const pid_t child = fork();
    if (child < 0) return become_stock(rsync, arguments);
    if (child == 0) become_child(rsync, arguments, ends[1]);
    close(ends[1]);
    const bakjob::UniqueFd output(ends[0]);

    bool stopped = false;
    const auto publish = [&] {
        if (figures.listed <= most || stopped) return file.write(moved_line(figures) + reached_line(figures));
        std::fprintf(stderr, "%s: more than %llu files: starts anew without listing all of them first\n",
                     rsync.name, static_cast<unsigned long long>(most));
        stopped = kill(child, SIGTERM) == 0;
    };
    read_lines(
        output.get(), [&](std::string_view line) { take_progress_line(line, figures); }, publish);
    const int status = wait_for(child);
    return stopped ? std::nullopt : std::optional(status);
}

bool went_to_its_end(int status)
{
    constexpr std::array CODES = {0, 23, 24, 25}; // done, but for some files or deletions
    return std::find(CODES.begin(), CODES.end(), status) != CODES.end();
}

} // namespace

void forget_total(const std::string &job_name)
{
    std::remove(total_path(job_name).c_str());
}

int run_with_figures(const StockProgram &rsync, const std::string &job_name,
                     std::vector<std::string> arguments)
{
    forget_total(job_name);
    make_talk(arguments);
    arguments.insert(arguments.begin() + 1, WHOLE_LIST);
    const FiguresFile file("/tmp/r_" + job_name);
    Figures figures;
    std::optional<int> status = run_once(rsync, arguments, most_listed(), figures, file);
    if (!status) {
        arguments[1] = LIST_IN_PIECES;
        figures = Figures();
        status = run_once(rsync, arguments, UINT64_MAX, figures, file);
    }
    if (went_to_its_end(*status)) {
        figures.reached = figures.all * 100;
        file.write(moved_line(figures) + reached_line(figures));
        FiguresFile(total_path(job_name)).write(moved_line(figures));
    }
    return *status;
}
