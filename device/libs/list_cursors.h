#pragma once

// Shortcuts for walks through the lists of the store: they remember where the latest look-ups ended and go on
// from there.

#include <array>
#include <pugixml.hpp>
#include <string>
#include <string_view>

namespace device
{

// Finds numbered nodes, "item:N", without counting from the first each time.
class ListCursors
{
public:
    // The `index`-th child of `parent` with that name. When there are fewer: a null node, or with `create` a
    // new one after as many others as it takes.
    pugi::xml_node numbered_child(pugi::xml_node parent, std::string_view name, int index, bool create);

    // To be called whenever nodes go.
    void forget() { cursors_ = {}; }

private:
    struct Cursor {
        pugi::xml_node parent;
        std::string name;
        int index = 0;
        pugi::xml_node node;
        unsigned long used = 0;
    };

    Cursor &cursor_of(pugi::xml_node parent, std::string_view name);

    std::array<Cursor, 8> cursors_;
    unsigned long uses_ = 0;
};

// Finds the keys of the record that was looked up last: whoever asks for one key of a record mostly asks for
// the others next, and in the order they stand in. So neither is the record's path taken apart again, nor are
// the keys searched from the first.
class RecordCursor
{
public:
    // The record is the node at this path.
    void enter(std::string_view path, pugi::xml_node record);

    // Whether that is the record's path.
    [[nodiscard]] bool is_at(std::string_view path) const { return record_ && path == path_; }

    // The record's child of that name; with `create` a new one when there is none.
    pugi::xml_node key(const char *name, bool create);

    // To be called whenever nodes go.
    void forget() { record_ = {}; }

private:
    std::string path_;
    pugi::xml_node record_;
    pugi::xml_node key_; // found last
};

} // namespace device
