#include "platform/linux/properties/property_rules.h"

#include <algorithm>

namespace sentrova {
namespace {

bool is_name_character(char c) {
  constexpr std::string_view kPunctuation = "._-:@";
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
         kPunctuation.find(c) != std::string_view::npos;
}

}  // namespace

bool is_property_name(std::string_view name) {
  if (name.empty() || name.size() > kMaxNameBytes || name.front() == '.' || name.back() == '.') {
    return false;
  }
  return name.find("..") == std::string_view::npos &&
         std::all_of(name.begin(), name.end(), is_name_character);
}

bool is_read_only_property(std::string_view name) {
  return name.starts_with("ro.");
}

size_t max_value_bytes(std::string_view name) {
  return is_read_only_property(name) ? kMaxReadOnlyValueBytes : kMaxValueBytes;
}

bool is_property_value(std::string_view name, std::string_view value) {
  return value.size() <= max_value_bytes(name) && value.find('\0') == std::string_view::npos;
}

}  // namespace sentrova
