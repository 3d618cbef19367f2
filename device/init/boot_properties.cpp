#include "device/init/boot_properties.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/properties.h>
#include <android-base/strings.h>

namespace sentrova::device {
namespace {

constexpr char kDefaultProperties[] = "/default.prop";
constexpr char kKernelCommandLine[] = "/proc/cmdline";
constexpr std::string_view kCommandLinePrefix = "prop.";

std::string read_text(const char* path) {
  std::string text;
  if (!android::base::ReadFileToString(path, &text)) {
    PLOG(ERROR) << "cannot read " << path;
  }
  return text;
}

// A property of the command line stands before the same one of the file.
bool is_set_already(const std::string& name) {
  return !android::base::GetProperty(name, "").empty();
}

void set_all(const std::vector<Property>& properties) {
  for (const Property& property : properties) {
    if (!is_set_already(property.name) &&
        !android::base::SetProperty(property.name, property.value)) {
      PLOG(ERROR) << "cannot set property " << property.name;
    }
  }
}

}  // namespace

std::vector<Property> parse_property_text(std::string_view text) {
  std::vector<Property> properties;
  for (const std::string& line : android::base::Split(std::string(text), "\n")) {
    const std::string trimmed = android::base::Trim(line);
    const size_t equals = trimmed.find('=');
    if (trimmed.empty() || trimmed[0] == '#' || equals == std::string::npos) {
      continue;
    }
    properties.push_back({android::base::Trim(trimmed.substr(0, equals)),
                          android::base::Trim(trimmed.substr(equals + 1))});
  }
  return properties;
}

std::vector<Property> parse_command_line(std::string_view command_line) {
  std::vector<Property> properties;
  for (const std::string& word : android::base::Split(std::string(command_line), " \t\n")) {
    const size_t equals = word.find('=');
    if (word.starts_with(kCommandLinePrefix) && equals != std::string::npos) {
      properties.push_back(
          {word.substr(kCommandLinePrefix.size(), equals - kCommandLinePrefix.size()),
           word.substr(equals + 1)});
    }
  }
  return properties;
}

void seed_properties() {
  set_all(parse_command_line(read_text(kKernelCommandLine)));
  set_all(parse_property_text(read_text(kDefaultProperties)));
}

}  // namespace sentrova::device
