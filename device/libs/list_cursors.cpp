#include "list_cursors.h"

#include <algorithm>

using pugi::xml_node;

namespace device
{
namespace
{

bool is_named(xml_node node, std::string_view name)
{
    return node.type() == pugi::node_element && node.name() == name;
}

xml_node next_named(xml_node node, std::string_view name)
{
    do {
        node = node.next_sibling();
    } while (node && !is_named(node, name));
    return node;
}

xml_node previous_named(xml_node node, std::string_view name)
{
    do {
        node = node.previous_sibling();
    } while (node && !is_named(node, name));
    return node;
}

xml_node first_named(xml_node parent, std::string_view name)
{
    const xml_node first = parent.first_child();
    return !first || is_named(first, name) ? first : next_named(first, name);
}

} // namespace

// A list that has no cursor gets the one that was used longest ago.
ListCursors::Cursor &ListCursors::cursor_of(xml_node parent, std::string_view name)
{
    Cursor *oldest = &cursors_.front();
    for (Cursor &cursor : cursors_) {
        if (cursor.parent == parent && cursor.name == name) return cursor;
        if (cursor.used < oldest->used) oldest = &cursor;
    }
    *oldest = {parent, std::string(name), 0, {}, {}, 0};
    return *oldest;
}

xml_node ListCursors::numbered_child(xml_node parent, std::string_view name, int index, bool create)
{
    Cursor &cursor = cursor_of(parent, name);
    cursor.used = ++uses_;
    xml_node node = cursor.node;
    int at = cursor.index;
    if (at == 0 || index < at / 2) {
        node = first_named(parent, name);
        at = 1;
    }
    if (!node && create) node = parent.append_child(cursor.name.c_str());
    for (; node && at > index; --at) {
        node = previous_named(node, name);
    }
    for (; node && at < index; ++at) {
        const xml_node next = next_named(node, name);
        node = next || !create ? next : parent.append_child(cursor.name.c_str());
    }
    if (node && node != cursor.node) {
        cursor.node = node;
        cursor.index = index;
        cursor.key = {};
    }
    return node;
}

xml_node ListCursors::record_key(xml_node record, std::string_view name)
{
    const auto is_its_cursor = [&](const Cursor &cursor) { return cursor.node == record; };
    const auto cursor = std::find_if(cursors_.begin(), cursors_.end(), is_its_cursor);
    if (cursor == cursors_.end() || !cursor->key) {
        const xml_node found = first_named(record, name);
        if (found && cursor != cursors_.end()) cursor->key = found;
        return found;
    }
    xml_node found = is_named(cursor->key, name) ? cursor->key : next_named(cursor->key, name);
    if (!found) found = first_named(record, name);
    if (found) cursor->key = found;
    return found;
}

} // namespace device
