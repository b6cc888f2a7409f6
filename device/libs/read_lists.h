#pragma once

// Remembers which lists were read, and which of them have changed with the tree and were not read again: what
// a caller knows of such a list is out of date.

#include <functional>
#include <map>
#include <pugixml.hpp>
#include <set>
#include <string>
#include <string_view>
#include <vector>

namespace device
{

class ReadLists
{
public:
    // A read without a numbered step, such as that of a count, begins a walk: its list is up to date again.
    void read(std::string_view path);

    // The lists that were read from the present tree, or have not changed since.
    [[nodiscard]] const std::vector<std::string> &current() const { return current_; }

    // To be called when the tree was replaced; `same` tells whether the new one has a list as it was.
    void tree_changed(const std::function<bool(const std::string &list)> &same);

    // Whether the path lies in an outdated list, or contains one.
    [[nodiscard]] bool outdated(std::string_view path) const;

private:
    std::vector<std::string> current_;
    std::vector<std::string> outdated_;
};

// Lists with their texts in one tree, to be compared with those in another one.
using ListTexts = std::map<std::string, std::string>;
ListTexts texts_of(const std::vector<std::string> &lists, pugi::xml_node root);

// Those that the tree has as they were. Without memory to compare them, fewer.
std::set<std::string> unchanged(const ListTexts &before, pugi::xml_node root);

} // namespace device
