// watch: follows a run of a job to its end.

#include "common/job_files.h"
#include "common/private_file.h"
#include "common/text.h"
#include "config/job_state.h"
#include "jobs/jobs.h"
#include "jobs/summary.h"
#include "output/failure.h"
#include "output/on_signal.h"
#include "runs/commands.h"

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <fcntl.h>
#include <nlohmann/json.hpp>
#include <optional>
#include <sstream>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace bakjob::ctl
{

namespace
{

using Clock = std::chrono::steady_clock;

constexpr auto LOOK_EVERY = std::chrono::milliseconds(200);
constexpr auto WAIT_FOR_START = std::chrono::seconds(3);
constexpr auto LINE_EVERY = std::chrono::seconds(5); // where lines stay
constexpr std::size_t BAR_WIDTH = 30;
constexpr char CLEAR_LINE[] = "\r\033[K";

// What the appliance's rsync publishes of a folder's transfer.
struct Figures {
    std::uint64_t files; // moved
    std::uint64_t bytes;
    std::uint64_t reached; // of the list of all files, in hundredths
    std::uint64_t all;     // 0 while the list is not whole
};

struct Progress {
    std::string folder; // empty before the first one
    std::string place;  // "2/3"
    std::optional<Figures> figures;
};

struct Published {
    std::string text;
    std::int64_t written; // nanoseconds
};

// A file of a run; others may have put something else in its place.
std::optional<Published> read_published(const std::string &path)
{
    const UniqueFd file = open_own_file(path, O_RDONLY);
    struct stat status = {};
    char text[4096] = "";
    if (!file || fstat(file.get(), &status) != 0) return std::nullopt;
    const ssize_t length = read(file.get(), text, sizeof text);
    if (length < 0) return std::nullopt;
    return Published{{text, static_cast<std::size_t>(length)},
                     std::int64_t{status.st_mtim.tv_sec} * 1'000'000'000 + status.st_mtim.tv_nsec};
}

std::optional<Figures> figures_in(const Published &published)
{
    std::istringstream text(published.text);
    Figures figures{};
    if (text >> figures.files >> figures.bytes >> figures.reached >> figures.all) return figures;
    return std::nullopt;
}

// Figures that are older than the folder are an earlier transfer's.
Progress read_progress(const JobName &name)
{
    Progress progress;
    const auto folder = read_published(progress_file(name));
    if (!folder) return progress;
    std::istringstream lines(folder->text);
    std::getline(lines, progress.folder);
    std::getline(lines, progress.place);
    const auto published = read_published(transfer_file(name));
    if (published && published->written >= folder->written) progress.figures = figures_in(*published);
    return progress;
}

// Nullopt while scanning: it is not known how much there is.
std::optional<int> per_cent(const Progress &progress)
{
    if (!progress.figures || progress.figures->all == 0) return std::nullopt;
    const Figures &figures = *progress.figures;
    return static_cast<int>(static_cast<double>(std::min(figures.reached, figures.all)) * 100 /
                            static_cast<double>(figures.all));
}

std::string words_of(const Progress &progress)
{
    if (progress.folder.empty()) return "starting";
    std::string words = "folder " + progress.place + "  " + printable(progress.folder) + "  ";
    const auto share = per_cent(progress);
    words += share ? format_text("%3d %%", *share) : "scanning";
    const auto bytes = progress.figures ? progress.figures->bytes : 0;
    if (bytes == 0 && !share) return words;
    return words + format_text("  %llu bytes moved", static_cast<unsigned long long>(bytes));
}

Json json_of(const Progress &progress)
{
    Json json{{"folder", progress.folder}, {"place", progress.place}};
    if (progress.figures) {
        json["files"] = progress.figures->files;
        json["bytes"] = progress.figures->bytes;
    }
    if (const auto share = per_cent(progress)) {
        json["percent"] = *share;
        json["all_files"] = progress.figures->all / 100;
    }
    return json;
}

// Tells the progress in whichever way the output takes it.
class Teller
{
public:
    explicit Teller(bool json) : json_(json), terminal_(!json && isatty(STDOUT_FILENO) == 1)
    {
        if (terminal_)
            on_signal_.emplace([] {
                if (write(STDOUT_FILENO, CLEAR_LINE, sizeof CLEAR_LINE - 1) < 0) return;
            });
    }
    Teller(const Teller &) = delete;
    Teller &operator=(const Teller &) = delete;
    ~Teller()
    {
        if (terminal_) std::fputs(CLEAR_LINE, stdout);
    }

    void tell(const Progress &progress)
    {
        if (terminal_) return draw(progress);
        // A line when the folder changes or its transfer begins, and now and then between.
        const std::string step = progress.place + (per_cent(progress) ? "t" : "l");
        const bool due = Clock::now() >= next_;
        const std::string line = json_ ? json_of(progress).dump(-1, ' ', true, Json::error_handler_t::replace)
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
        std::printf("%s%s", CLEAR_LINE, std::string(fitting(line, columns())).c_str());
        std::fflush(stdout);
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
    std::optional<OnSignal> on_signal_;
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

// Follows the run to its end. Whether it was a restore, which has a state of its own.
bool follow(const std::string &name, bool json)
{
    Teller teller(json);
    const auto checked = JobName::checked(name);
    bool restore = false;
    Clock::time_point next_look{};
    while (run_of(name) == Run::GOING_ON) {
        if (checked) teller.tell(read_progress(*checked));
        if (Clock::now() >= next_look) {
            const Standing standing = standing_of(read_job(name).record, StateKind::RESTORE);
            restore = rsync_state_is_running(standing.state) == 1;
            next_look = Clock::now() + std::chrono::seconds(1);
        }
        std::this_thread::sleep_for(LOOK_EVERY);
    }
    return restore;
}

} // namespace

int watch_job(const Request &request)
{
    read_job(request.name);
    const bool ran = wait_for_start(request.name);
    const bool restore = ran && follow(request.name, request.json);
    const Summary summary = summary_of(read_job(request.name));
    if (request.json) {
        print_json(json_of(summary), -1);
    } else {
        std::printf("%s: %s%s %s\n", printable(summary.name).c_str(),
                    ran ? "" : "no run is going on; the last: ",
                    (restore ? "restore " + summary.restore : summary.last).c_str(),
                    (restore ? summary.restore_time : summary.time).c_str());
    }
    const Outcome outcome = restore ? summary.restore_outcome : summary.outcome;
    return outcome == Outcome::FAILED ? EXIT_TROUBLE : EXIT_FINE;
}

} // namespace bakjob::ctl
