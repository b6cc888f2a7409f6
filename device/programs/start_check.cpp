#include "start_check.h"

#include <algorithm>
#include <filesystem>
#include <string_view>
#include <system_error>

namespace
{

namespace fs = std::filesystem;

// More than the names that a job leaves out. To list as many costs nothing.
constexpr int MANY_NAMES = 100;

bool is_here(std::string_view end)
{
    return end.starts_with('/');
}

bool has_many_names(const std::string &folder)
{
    std::error_code error;
    int names = 0;
    for (fs::directory_iterator name(folder, error), end; !error && name != end; name.increment(error)) {
        if (++names >= MANY_NAMES) return true;
    }
    return false;
}

// The folder itself can stand for its contents where rsync says the same of both: with a target here that is
// a folder already, with one over there when there are contents.
bool may_stand_for_contents(const std::string &source, const std::string &target)
{
    std::error_code error;
    if (!source.ends_with('/')) return false;
    return is_here(source) ? has_many_names(source) : is_here(target) && fs::is_directory(target, error);
}

bool is_root(std::string_view path)
{
    return path.size() == 1 || path[path.size() - 2] == ':';
}

} // namespace

std::vector<std::string> start_check(std::vector<std::string> arguments)
{
    // Behind the values of options stand the two ends.
    const auto is_end = [](const std::string &argument) { return !argument.starts_with('-'); };
    const auto target = std::find_if(arguments.rbegin(), arguments.rend(), is_end);
    const auto source =
        target == arguments.rend() ? target : std::find_if(target + 1, arguments.rend(), is_end);
    if (source != arguments.rend() && may_stand_for_contents(*source, *target)) {
        while (source->ends_with('/') && !is_root(*source)) {
            source->pop_back();
        }
        // Otherwise it would be taken for one thing, whose target may become a file. Its own name is nothing
        // that comes to the target.
        if (!target->ends_with('/') && !target->ends_with(':')) *target += '/';
        arguments.insert(arguments.begin() + 1, "--exclude=*");
    }
    arguments.insert(arguments.end(), {"--no-recursive", "--dirs"});
    return arguments;
}
