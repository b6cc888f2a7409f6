#pragma once

// Texts in buffers of a fixed size, as the records and the appliance's other parts have them.

#include <cstddef>
#include <string_view>

namespace bakjob
{

inline constexpr std::size_t PATH_SIZE = 1024; // bytes of a path buffer, terminator included

// Copies `source` into the field as a terminated text. A text that does not fit, or holds a zero byte, is
// refused: false, and the field is as it was.
bool copy_text(char *field, std::size_t size, std::string_view source);

template <std::size_t N>
bool copy_text(char (&field)[N], std::string_view source)
{
    return copy_text(field, N, source);
}

} // namespace bakjob

// For users outside the module: puts a backslash before each of the characters $ ` # % ^ & ( ) + { } ; [ ]
// ' = and blank, in place. `text` must have room for PATH_SIZE bytes; an escaped text that would not fit ends
// before the first character that does not. Null, and the text untouched, when nothing needs an escape; else
// `text`.
extern "C" char *fix_path_special_char(char *text);
