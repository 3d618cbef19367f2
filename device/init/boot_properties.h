#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace sentrova::device {

struct Property {
  std::string name;
  std::string value;
  bool operator==(const Property&) const = default;
};

// The properties of a property file's text: lines NAME=VALUE, blanks around both left out; empty
// lines, comments from a leading '#' and lines without '=' are passed over.
std::vector<Property> parse_property_text(std::string_view text);

// The properties among the words of a kernel command line: words "prop.NAME=VALUE".
std::vector<Property> parse_command_line(std::string_view command_line);

// Sets the properties of the kernel command line, then those of /default.prop, so that a "ro."
// property of the command line is kept. What the store refuses is logged.
void seed_properties();

}  // namespace sentrova::device
