#pragma once

#include <limits.h>
#include <stddef.h>

#include <string_view>

namespace sentrova {

// Longest value of an ordinary property: the platform's PROP_VALUE_MAX (92) less its final NUL.
inline constexpr size_t kMaxValueBytes = 91;
// Longest value of a "ro." property. The platform sets no limit of its own for these; this one
// bounds what a reader takes from a file.
inline constexpr size_t kMaxReadOnlyValueBytes = 4096;
// Longest name: a name is a file name in the store.
inline constexpr size_t kMaxNameBytes = NAME_MAX;

// Tells whether `name` may name a property: 1 to kMaxNameBytes characters of A-Z a-z 0-9 . _ - : @,
// no dot first or last, no two dots in a row. Such a name is never a path.
bool is_property_name(std::string_view name);

// Tells whether the property is written once and then kept ("ro." names).
bool is_read_only_property(std::string_view name);

// Returns the longest value, in bytes, that the property of this name may have.
size_t max_value_bytes(std::string_view name);

// Tells whether the property of this name may have this value: short enough, without a NUL.
bool is_property_value(std::string_view name, std::string_view value);

}  // namespace sentrova
