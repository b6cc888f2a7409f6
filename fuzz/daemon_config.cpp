// A remote daemon's configuration, and the modules that are read from it.

#include "remote/daemon_config.h"

#include "common/job_files.h"
#include "common/private_file.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "fuzz.h"
#include "remote/discovery.h"
#include "shell_model.h"

#include <set>

using namespace bakjob;

namespace
{

void check_lines(const std::vector<std::string> &lines)
{
    std::size_t at = 0;
    read_daemon_config(DISCOVERY_CONFIG_COPY, [&](const std::string &line) {
        must(at < lines.size() && line.size() <= LINE_LENGTH, "no more lines than there are");
        const std::string &whole = lines[at++];
        must(whole.size() > LINE_LENGTH ? line.size() == LINE_LENGTH : line == trimmed(whole),
             "a line is whole, or plainly too long");
        const auto name = section_name(line);
        const auto path = path_of_line(line);
        must(!name || contains(line, *name), "a name stands in its line");
        must(!path || line.ends_with(*path), "a path ends its line");
        must(!name || !path, "a line is a header or a path");
        return true;
    });
    must(at == lines.size(), "no line is left out");
}

// What stands between the third byte of a line and the one in front of the last bracket, or behind the key.
void add_name(std::set<std::string> &names, const std::string &line)
{
    const std::size_t bracket = line.rfind(']');
    if (contains(line, "[") && bracket != std::string::npos && bracket > 2)
        names.insert(line.substr(2, bracket - 3));
}

void add_path(std::set<std::string> &paths, const std::string &line)
{
    const std::string whole = trimmed(line);
    if (contains(whole, "path = ")) paths.insert(whole.substr(7));
}

void check_commands(const std::string &path)
{
    if (!refusal_for_shells("path", path))
        must(is_word(path, path), "a plain path is what it is to any shell");
    const auto escaped = shell_path("path", path);
    if (!escaped) return;
    must(is_word(*escaped, path), "an escaped path is one word");
    const auto here = shell_words(in_single_quotes("cd " + *escaped));
    must(here && here->size() == 1, "a remote command is one word here");
    must(shell_words(here->front()) == std::vector<std::string>{"cd", path},
         "and the path is one word there");
}

} // namespace

void check(std::string_view config)
{
    must(replace_file(DISCOVERY_CONFIG_COPY, 0600, config), "a file can be written");
    const auto lines = lines_of(config);
    check_lines(lines);
    rsync_free_modules();
    add_configured_modules(DISCOVERY_CONFIG_COPY);
    std::set<std::string> names;
    std::set<std::string> paths;
    for (const std::string &line : lines) {
        add_name(names, line);
        add_path(paths, line);
    }
    check_module_list([&](const RemoteModule &module) {
        return names.count(module.name) == 1 && paths.count(module.path) == 1;
    });
    for (const RemoteModule *module = module_list->head; module != nullptr; module = module->next)
        check_commands(module->path);
}
