// watch: follows a run of a job to its end.

#include "commands.h"
#include "common/job_files.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "failure.h"
#include "jobs.h"
#include "summary.h"

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <fstream>
#include <optional>
#include <sys/ioctl.h>
#include <thread>
#include <unistd.h>

namespace bakjob::ctl
{

namespace
{

using Clock = std::chrono::steady_clock;

constexpr auto LOOK_EVERY = std::chrono::milliseconds(200);
constexpr auto WAIT_FOR_START = std::chrono::seconds(1);
constexpr auto LINE_EVERY = std::chrono::seconds(5); // where lines stay
constexpr std::size_t BAR_WIDTH = 30;

struct Figures {
    std::uint64_t files;
    std::uint64_t bytes;
};

// What bakjob and the appliance's rsync publish of a run.
struct Progress {
    std::string folder; // empty before the first one
    std::string place;  // "2/3"
    std::optional<Figures> total;
    std::optional<Figures> moved;
};

std::optional<Figures> read_figures(const std::string &path)
{
    std::ifstream file(path);
    Figures figures{};
    if (file >> figures.files >> figures.bytes) return figures;
    return std::nullopt;
}

Progress read_progress(const std::string &name)
{
    Progress progress;
    std::ifstream file(progress_file(name));
    std::getline(file, progress.folder);
    std::getline(file, progress.place);
    progress.total = read_figures(transfer_size_file(name));
    progress.moved = read_figures(transfer_file(name));
    return progress;
}

// Nothing while there are no figures of a transfer, or none of how much it is about.
std::optional<int> per_cent(const Progress &progress)
{
    if (!progress.moved || !progress.total) return std::nullopt;
    if (progress.total->bytes == 0) return 100;
    const std::uint64_t moved = std::min(progress.moved->bytes, progress.total->bytes);
    return static_cast<int>(static_cast<double>(moved) * 100 / static_cast<double>(progress.total->bytes));
}

std::string words_of(const Progress &progress)
{
    if (progress.folder.empty()) return "starting";
    std::string words = "folder " + progress.place + "  " + printable(progress.folder) + "  ";
    const auto share = per_cent(progress);
    if (!share) return words + "looking what there is to do";
    return words + format_text("%3d %%  %llu of %llu bytes", *share,
                               static_cast<unsigned long long>(progress.moved->bytes),
                               static_cast<unsigned long long>(progress.total->bytes));
}

Json json_of(const Progress &progress)
{
    Json json{{"folder", progress.folder}, {"place", progress.place}};
    if (const auto share = per_cent(progress)) {
        json["percent"] = *share;
        json["bytes"] = progress.moved->bytes;
        json["of_bytes"] = progress.total->bytes;
        json["files"] = progress.moved->files;
        json["of_files"] = progress.total->files;
    }
    return json;
}

// Tells the progress in whichever way the output takes it.
class Teller
{
public:
    explicit Teller(bool json) : json_(json), terminal_(!json && isatty(STDOUT_FILENO) == 1) {}
    Teller(const Teller &) = delete;
    Teller &operator=(const Teller &) = delete;
    ~Teller()
    {
        if (drawn_) std::fputs("\r\033[K", stdout);
    }

    void tell(const Progress &progress)
    {
        if (terminal_) return draw(progress);
        // A line when the folder changes or its transfer begins, and now and then between.
        const std::string step = progress.place + (progress.moved ? "t" : "l");
        const bool due = Clock::now() >= next_;
        const std::string line = json_
                                     ? json_of(progress).dump(-1, ' ', false, Json::error_handler_t::replace)
                                     : words_of(progress);
        if (step == step_ && (!due || line == line_)) return;
        step_ = step;
        line_ = line;
        next_ = Clock::now() + LINE_EVERY;
        std::puts(line.c_str());
        std::fflush(stdout);
    }

private:
    // A line that is longer than the terminal is wide could not be drawn over.
    void draw(const Progress &progress)
    {
        const auto share = per_cent(progress);
        const auto filled = static_cast<std::size_t>(share.value_or(0)) * BAR_WIDTH / 100;
        const std::string bar = '[' + std::string(filled, '#') + std::string(BAR_WIDTH - filled, '.') + "] ";
        const std::string line = (share ? bar : "") + words_of(progress);
        std::printf("\r\033[K%s", std::string(fitting(line, columns())).c_str());
        std::fflush(stdout);
        drawn_ = true;
    }

    static std::size_t columns()
    {
        winsize size{};
        constexpr std::size_t USUAL = 80;
        const bool known = ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 0;
        return (known ? size.ws_col : USUAL) - 1;
    }

    bool json_;
    bool terminal_;
    bool drawn_ = false;
    std::string step_;
    std::string line_;
    Clock::time_point next_;
};

bool wait_for_start(const std::string &name)
{
    const auto end = Clock::now() + WAIT_FOR_START;
    while (run_of(name) != Run::GOING_ON) {
        if (Clock::now() >= end) return false;
        std::this_thread::sleep_for(LOOK_EVERY);
    }
    return true;
}

} // namespace

int watch_job(const Request &request)
{
    read_job(request.name);
    const bool ran = wait_for_start(request.name);
    if (ran) {
        Teller teller(request.json);
        while (run_of(request.name) == Run::GOING_ON) {
            teller.tell(read_progress(request.name));
            std::this_thread::sleep_for(LOOK_EVERY);
        }
    }
    const Summary summary = summary_of(read_job(request.name));
    if (request.json) {
        print_json(json_of(summary), -1);
    } else {
        std::printf("%s: %s%s %s\n", printable(summary.name).c_str(),
                    ran ? "" : "no run is going on; the last: ", summary.last.c_str(), summary.time.c_str());
    }
    return summary.outcome == Outcome::FAILED ? EXIT_TROUBLE : EXIT_FINE;
}

} // namespace bakjob::ctl
