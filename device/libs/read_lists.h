#pragma once

// Remembers the lists of which something was read from an earlier tree, and nothing since from the present
// one, in which they are different. What somebody knows of such a list is no longer so.

#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace device
{

class ReadLists
{
public:
    // A read without a numbered step, as that of a count, begins a walk: its list is known anew.
    void read(std::string_view path);

    // The lists that are known as they are in the present tree.
    [[nodiscard]] const std::vector<std::string> &current() const { return current_; }

    // The tree is another one from now on; `same` tells whether a list is in it as it was.
    void tree_changed(const std::function<bool(const std::string &list)> &same);

    // Whether the path lies in an outdated list, or holds one.
    [[nodiscard]] bool outdated(std::string_view path) const;

private:
    std::vector<std::string> current_;
    std::vector<std::string> outdated_;
};

} // namespace device
