#include "store_path.h"

#include "common/text.h"

#include <algorithm>

namespace device
{
namespace
{

bool parse_step(std::string_view text, Step &step)
{
    const std::size_t colon = text.find(':');
    step = {text.substr(0, colon), 0};
    if (!is_node_name(step.name)) return false;
    if (colon == std::string_view::npos) return true;
    step.index = bakjob::whole_number(text.substr(colon + 1), 1, StorePath::MAX_INDEX).value_or(0);
    return step.index > 0;
}

} // namespace

bool is_node_name(std::string_view name)
{
    const auto is_start = [](unsigned char c) {
        return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_' || c >= 0x80;
    };
    const auto is_inner = [&](unsigned char c) {
        return is_start(c) || (c >= '0' && c <= '9') || c == '-' || c == '.';
    };
    return !name.empty() && is_start(static_cast<unsigned char>(name.front())) &&
           std::all_of(name.begin(), name.end(), is_inner);
}

bool StorePath::numbered() const
{
    return std::any_of(steps.begin(), steps.begin() + depth, [](const Step &step) { return step.index > 0; });
}

std::string_view StorePath::record() const
{
    if (depth < 2 || steps[depth - 1].index > 0 || steps[depth - 2].index == 0) return {};
    const char *const begin = steps[0].name.data() - 1;
    const char *const end = steps[depth - 1].name.data() - 1;
    return {begin, end};
}

StorePath parse_store_path(std::string_view text)
{
    StorePath path;
    if (!text.starts_with('/')) return {};
    while (!text.empty()) {
        text.remove_prefix(1);
        const std::size_t length = std::min(text.find('/'), text.size());
        if (path.depth == StorePath::MAX_STEPS) return {};
        if (!parse_step(text.substr(0, length), path.steps[path.depth])) return {};
        ++path.depth;
        text.remove_prefix(length);
    }
    return path;
}

} // namespace device
