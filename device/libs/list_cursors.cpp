#include "list_cursors.h"

#include "xml_tree.h"

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

// The first element from there on that is named like `node`, which may be an instruction of that name.
xml_node element_from(xml_node node)
{
    while (node && node.type() != pugi::node_element) {
        node = node.next_sibling(node.name());
    }
    return node;
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
    *oldest = {parent, std::string(name), 0, {}, 0};
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
    if (!node && create) node = append_element(parent, cursor.name.c_str());
    for (; node && at > index; --at) {
        node = previous_named(node, name);
    }
    for (; node && at < index; ++at) {
        const xml_node next = next_named(node, name);
        node = next || !create ? next : append_element(parent, cursor.name.c_str());
    }
    if (node && node != cursor.node) {
        cursor.node = node;
        cursor.index = index;
    }
    return node;
}

void RecordCursor::enter(std::string_view path, xml_node record)
{
    path_ = path;
    record_ = record;
    key_ = {};
}

xml_node RecordCursor::key(const char *name, bool create)
{
    xml_node found = is_named(key_, name) ? key_ : element_from(key_.next_sibling(name));
    if (!found) found = element_from(record_.child(name));
    if (!found && create) found = append_element(record_, name);
    if (found) key_ = found;
    return found;
}

} // namespace device
