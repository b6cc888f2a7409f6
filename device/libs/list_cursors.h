#pragma once

// Finds numbered nodes, "item:N", without counting from the first each time: it remembers where the latest
// look-ups of a few lists ended and walks on from there.

#include <array>
#include <pugixml.hpp>
#include <string>
#include <string_view>

namespace device
{

class ListCursors
{
public:
    // The `index`-th child of `parent` with that name. When there are fewer: a null node, or with `create` a
    // new one after as many others as it takes.
    pugi::xml_node numbered_child(pugi::xml_node parent, std::string_view name, int index, bool create);

    // The child of that name of a node that numbered_child found. Such a node is a record, whose keys are
    // unique and mostly asked for in the order they stand in: the search begins where the last one ended.
    pugi::xml_node record_key(pugi::xml_node record, std::string_view name);

    // To be called whenever nodes go.
    void forget() { cursors_ = {}; }

private:
    struct Cursor {
        pugi::xml_node parent;
        std::string name;
        int index = 0;
        pugi::xml_node node;
        pugi::xml_node key; // the child of `node` found last
        unsigned long used = 0;
    };

    Cursor &cursor_of(pugi::xml_node parent, std::string_view name);

    std::array<Cursor, 8> cursors_;
    unsigned long uses_ = 0;
};

} // namespace device
