#pragma once

// What the store needs of a tree beyond pugixml: values in several pieces, nodes that are whole or not there,
// and a limit to how deep elements may lie in each other.

#include <pugixml.hpp>
#include <string>
#include <string_view>

namespace device
{

// Parses the text, which must have the root <config>. Null, or why it is not to be used; throws
// std::bad_alloc.
const char *parse_tree(pugi::xml_document &document, const std::string &text);

// The text of a node: its pieces together, as comments and CDATA sections cut it. Valid until the next call
// or change.
std::string_view value_of(pugi::xml_node node);

// Puts a text in the place of all pieces; comments stay. False without memory.
bool set_value(pugi::xml_node node, const char *text);

// A new last element; a null node, and none appended, without memory.
pugi::xml_node append_element(pugi::xml_node parent, const char *name);

// The tree as a file; throws std::bad_alloc.
std::string text_of(const pugi::xml_document &document);

// One node with everything below it, to be compared; throws std::bad_alloc.
std::string raw_text_of(pugi::xml_node node);

} // namespace device
