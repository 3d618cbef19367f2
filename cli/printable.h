#pragma once

#include <cstddef>
#include <string>

namespace sentrova {

// Text for a terminal. Names of files and processes are whatever their makers chose.

// The text with each byte as \xNN that is not part of a visible UTF-8 character: control
// characters, those that change the direction of writing, and what is not UTF-8. Such a text has no
// line end.
std::string printable(const std::string& text);

// How many columns a printable text takes.
size_t display_width(const std::string& text);

// The end of a printable text, in at most `width` columns, with "..." before it if that is not all.
std::string shortened(const std::string& text, size_t width);

}  // namespace sentrova
