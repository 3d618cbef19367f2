#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace sentrova::device {

struct Property {
  std::string name;
  std::string value;
};

// Longest property file that is read; a vendor's has a few kilobytes.
inline constexpr size_t kMaxPropertyFileBytes = 256 * 1024;
// Longest value that is taken: the platform's PROP_VALUE_MAX (92) less its final NUL.
inline constexpr size_t kMaxPropertyValueBytes = 91;

// Reads a property file whole. Returns nothing, with `errno`, where it cannot be read, is no
// regular file (a link counts as none) or is too long (EFBIG). The file may be anybody's.
std::optional<std::string> read_property_text(const std::string& path);

// Returns the properties of a text of lines NAME=VALUE, in order. Blanks around name and value are
// dropped; empty lines and lines beginning with '#' are passed over, and so are, with a warning
// that names `path` and the line (counted from 1), a line without "=" and a value that is too long.
std::vector<Property> parse_property_text(std::string_view text, const std::string& path);

// Puts the text into a file of mode 0644, which appears whole or not at all. False with `errno`.
bool write_property_text(const std::string& path, const std::string& text);

}  // namespace sentrova::device
