#pragma once

#include <optional>
#include <string>

namespace sentrova {

// The store that processes share: a folder with one file for each property, named after it and
// holding its value and nothing else. A file appears whole or not at all, so that readers need no
// lock. Callers have checked names and values (property_rules.h). All threads.

// Returns the value of a property, or nothing where it is not set, its file cannot be read, or what
// stands there is no value (not a regular file, too long, holding a NUL).
std::optional<std::string> read_property_file(const std::string& directory,
                                              const std::string& name);

// Sets a property. Returns true when readers see the value; false with `errno` and the store as it
// was, EEXIST where a "ro." property has a value already.
bool write_property_file(const std::string& directory, const std::string& name,
                         const std::string& value);

}  // namespace sentrova
