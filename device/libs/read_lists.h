#pragma once

// Remembers the lists of which something was read from an earlier tree and nothing from the present one. What
// somebody knows of such a list may no longer be so.

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

    // The tree is another one from now on.
    void tree_changed();

    // Whether the path lies in an outdated list, or holds one.
    [[nodiscard]] bool outdated(std::string_view path) const;

private:
    std::vector<std::string> current_;
    std::vector<std::string> outdated_;
};

} // namespace device
