#include "read_lists.h"

#include "store_path.h"
#include "xml_tree.h"

#include <algorithm>
#include <new>

namespace device
{

namespace
{

// Of "/list/item:2/name", and of "/list/count", it is "/list".
std::string_view list_of(std::string_view path)
{
    const std::string_view plain = path.substr(0, path.find(':'));
    return plain.substr(0, plain.rfind('/'));
}

std::string text_of_list(const std::string &list, pugi::xml_node root)
{
    const StorePath path = parse_store_path(list);
    for (const Step &step : path.used()) {
        root = plain_child(root, step.name);
    }
    return raw_text_of(root);
}

bool is_within(std::string_view path, std::string_view list)
{
    return path.starts_with(list) && (path.size() == list.size() || path[list.size()] == '/');
}

} // namespace

void ReadLists::read(std::string_view path)
{
    constexpr std::size_t MAX_LISTS = 64;
    const std::string_view list = list_of(path);
    std::erase(outdated_, list);
    const bool known = std::find(current_.begin(), current_.end(), list) != current_.end();
    if (!known && current_.size() < MAX_LISTS) current_.emplace_back(list);
}

void ReadLists::tree_changed(const std::function<bool(const std::string &list)> &same)
{
    const auto others = std::stable_partition(current_.begin(), current_.end(), same);
    outdated_.insert(outdated_.end(), others, current_.end());
    current_.erase(others, current_.end());
}

bool ReadLists::outdated(std::string_view path) const
{
    return std::any_of(outdated_.begin(), outdated_.end(), [&](const std::string &list) {
        return list == list_of(path) || is_within(list, path);
    });
}

ListTexts texts_of(const std::vector<std::string> &lists, pugi::xml_node root)
{
    ListTexts texts;
    for (const std::string &list : lists) {
        texts[list] = text_of_list(list, root);
    }
    return texts;
}

std::set<std::string> unchanged(const ListTexts &before, pugi::xml_node root)
{
    std::set<std::string> same;
    try {
        for (const auto &[list, text] : before) {
            if (text_of_list(list, root) == text) same.insert(list);
        }
    } catch (const std::bad_alloc &) {
        return same;
    }
    return same;
}

} // namespace device
