#pragma once

// Shortcuts for walks through the lists of the store: they remember where the latest look-ups ended and
// continue from there.

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

    // To be called when nodes are removed.
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

// Finds the keys of the record that was looked up last. Callers mostly ask for all keys of a record, in their
// order, so the record's path is not parsed again, and the search begins behind the key found last.
class RecordCursor
{
public:
    // The record is the node at this path.
    void enter(std::string_view path, pugi::xml_node record);

    // Whether that is the record's path.
    [[nodiscard]] bool is_at(std::string_view path) const { return record_ && path == path_; }

    // The record's child of that name; with `create` a new one when there is none.
    pugi::xml_node key(const char *name, bool create);

    // To be called when nodes are removed.
    void forget() { record_ = {}; }

private:
    std::string path_;
    pugi::xml_node record_;
    pugi::xml_node key_; // found last
};

} // namespace device
