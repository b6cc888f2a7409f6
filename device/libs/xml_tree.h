#pragma once

// What the store needs of a tree beyond pugixml: values in several pieces, nodes that are whole or absent,
// and a limit to how deep elements are nested.

#include <pugixml.hpp>
#include <string>
#include <string_view>

namespace device
{

// Parses the text, which must have the root <config>. Null, or why it is not to be used; throws
// std::bad_alloc.
const char *parse_tree(pugi::xml_document &document, const std::string &text);

// The text of a node, joined from the pieces that comments and CDATA sections cut it into. Valid until the
// next call or change.
std::string_view value_of(pugi::xml_node node);

// Replaces all pieces by one text; comments stay. False without memory.
bool set_value(pugi::xml_node node, const char *text);

// The first element of that name below the node; a null node when there is none.
pugi::xml_node plain_child(pugi::xml_node parent, std::string_view name);

// A new last element; a null node, and none appended, without memory.
pugi::xml_node append_element(pugi::xml_node parent, const char *name);

// The tree as a file; throws std::bad_alloc.
std::string text_of(const pugi::xml_document &document);

// A node with everything below it, for comparisons; throws std::bad_alloc.
std::string raw_text_of(pugi::xml_node node);

} // namespace device
