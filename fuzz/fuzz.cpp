#include "fuzz.h"

#include "common/text.h"

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <set>
#include <unistd.h>

using namespace bakjob;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *data, std::size_t size)
{
    check({reinterpret_cast<const char *>(data), size});
    return 0;
}

namespace
{

// The fuzzer closes standard error, where the stand-ins complain about every damaged file.
const int messages = dup(STDERR_FILENO);

} // namespace

void must(bool holds, const char *rule)
{
    if (holds) return;
    dprintf(messages, "Does not hold: %s\n", rule);
    std::abort();
}

UniqueFile open_text(std::string_view text)
{
    return UniqueFile(fmemopen(const_cast<char *>(text.data()), text.size(), "r"));
}

void write_file(const char *path, std::string_view text)
{
    const UniqueFile file(std::fopen(path, "w"));
    must(file && std::fwrite(text.data(), 1, text.size(), file.get()) == text.size(),
         "a file can be written");
}

std::string read_file(const char *path)
{
    std::string text;
    const UniqueFile file(std::fopen(path, "r"));
    if (!file) return text;
    for (int c = std::getc(file.get()); c != EOF; c = std::getc(file.get()))
        text += static_cast<char>(c);
    return text;
}

std::vector<std::string> lines_of(std::string_view text)
{
    std::vector<std::string> lines;
    while (!text.empty()) {
        const std::string_view line = text.substr(0, text.find('\n'));
        lines.emplace_back(line);
        text.remove_prefix(std::min(line.size() + 1, text.size()));
    }
    return lines;
}

std::string trimmed(std::string text)
{
    trim_right(text);
    return text;
}

void check_module_list(const std::function<bool(const RemoteModule &)> &known)
{
    std::set<std::string> names;
    int count = 0;
    const RemoteModule *last = nullptr;
    for (const RemoteModule *module = module_list->head; module != nullptr; module = module->next) {
        must(is_terminated(module->name) && is_terminated(module->path), "texts end within their fields");
        must(names.insert(module->name).second, "a name is listed once");
        must(known(*module), "a module is what one line of the text says");
        last = module;
        ++count;
    }
    must(count == module_list->count && count <= 1024, "the list holds as many as it counts, within limits");
    must(last == module_list->tail, "the tail is the last");
}
