#pragma once

// Paths of the configuration store, taken apart: "/backup_mgr/rsync/item:2/job_name".

#include <array>
#include <cstddef>
#include <span>
#include <string_view>

namespace device
{

struct Step {
    std::string_view name;
    int index = 0; // counted from 1; 0: the step has no number, and means the first of that name
};

struct StorePath {
    static constexpr std::size_t MAX_STEPS = 16;
    static constexpr int MAX_INDEX = 1'000'000; // setting a node creates all before it

    std::array<Step, MAX_STEPS> steps;
    std::size_t depth = 0; // 0: malformed

    [[nodiscard]] std::span<const Step> used() const { return {steps.data(), depth}; }
    [[nodiscard]] bool numbered() const;
    // Of "/list/item:2/key" the part before "/key"; empty when the path is not one of a numbered node's key.
    [[nodiscard]] std::string_view record() const;
};

// What may stand in an element's name. Anything else would make the file unreadable.
bool is_node_name(std::string_view name);

// A depth of 0 is the only failure. The steps are views into `text`.
StorePath parse_store_path(std::string_view text);

} // namespace device
