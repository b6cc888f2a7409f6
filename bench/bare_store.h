#pragma once

// What a state change is measured against: the XML library reading and writing the store's file, nothing
// else.

#include <pugixml.hpp>

inline bool parse_and_write(const char *file, const char *copy)
{
    pugi::xml_document document;
    return document.load_file(file) && document.save_file(copy, " ");
}
