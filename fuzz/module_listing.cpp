// A remote daemon's own listing of its modules.

#include "common/text.h"
#include "fuzz.h"
#include "remote/discovery.h"

#include <set>

using namespace bakjob;

namespace
{

std::string name_in(const std::string &whole_line)
{
    std::string name = trimmed(whole_line);
    name = name.substr(0, name.find('\t'));
    while (name.ends_with(' '))
        name.pop_back();
    return name;
}

} // namespace

void check(std::string_view listing)
{
    rsync_free_modules();
    const UniqueFile file = open_text(listing);
    for (std::string line; read_line(file.get(), line);) {
        const std::string name = module_of_listing_line(line);
        must(line.starts_with(name) && !name.ends_with(' '), "a name begins its line and ends in no blank");
        add_found_module(name, "");
    }
    std::set<std::string> names;
    for (const std::string &line : lines_of(listing))
        names.insert(name_in(line));
    check_module_list(
        [&](const RemoteModule &module) { return module.path[0] == '\0' && names.count(module.name) == 1; });
}
