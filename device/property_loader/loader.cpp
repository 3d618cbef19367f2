#include "device/property_loader/loader.h"

#include <android-base/logging.h>
#include <android-base/properties.h>
#include <android-base/strings.h>

#include <cerrno>
#include <optional>
#include <span>

#include "device/property_loader/property_file.h"

namespace sentrova::device {

using android::base::GetProperty;
using android::base::SetProperty;
using android::base::StartsWith;

namespace {

struct PropertySource {
  const char* path;
  const char* second_path;   // where the first cannot be read; null: none
  const char* working_copy;  // null: none
  const char* ready;
  const char* prefix;  // what each name must begin with
};

struct LoadRequest {
  const char* request;
  const char* completion;
  std::span<const PropertySource> sources;
};

constexpr char kOemReady[] = "recovery.oem_properties.ready";
constexpr char kKcfReady[] = "recovery.kcf_properties.ready";
constexpr char kOemCopy[] = "/tmp/oem.prop";
constexpr char kKcfCopy[] = "/tmp/kcf.prop";

constexpr PropertySource kVendorSources[] = {
    {"/oem/oem.prop", "/vendor/oem/oem.prop", kOemCopy, kOemReady, ""},
    {"/kcf/kcf.prop", "/vendor/kcf/kcf.prop", kKcfCopy, kKcfReady, ""},
};
constexpr PropertySource kBackupSources[] = {
    {"/cache/recovery/oem.prop", nullptr, kOemCopy, kOemReady, ""},
    {"/cache/recovery/kcf.prop", nullptr, kKcfCopy, kKcfReady, ""},
};
constexpr PropertySource kPersistentSources[] = {
    {"/data/property/persistent_properties", nullptr, nullptr,
     "recovery.persistent_properties.ready", "persist."},
};

constexpr LoadRequest kRequests[] = {
    {"recovery.load.props", "recovery.properties.loaded", kVendorSources},
    {"recovery.load.backup_props", "recovery.backup_props.loaded", kBackupSources},
    {"recovery.load.persist_props", "recovery.persist_properties.loaded", kPersistentSources},
};

constexpr const char* kRefusedPrefixes[] = {"ctl.", "sys.powerctl", "recovery."};

bool may_be_set(const std::string& name, const PropertySource& source) {
  for (const char* prefix : kRefusedPrefixes) {
    if (StartsWith(name, prefix)) {
      return false;
    }
  }
  return StartsWith(name, source.prefix);
}

void set_property(const Property& property, const PropertySource& source) {
  if (!may_be_set(property.name, source)) {
    LOG(WARNING) << source.path << ": not to be set from a file: " << property.name;
  } else if (GetProperty(property.name, "") != property.value &&
             !SetProperty(property.name, property.value)) {
    PLOG(WARNING) << source.path << ": cannot set " << property.name;
  }
}

// Returns the source's text; nothing, after saying why, where there is none to be had.
std::optional<std::string> read_source(const PropertySource& source) {
  std::optional<std::string> text = read_property_text(source.path);
  if (!text && source.second_path != nullptr) {
    PLOG(INFO) << "cannot read " << source.path;
    text = read_property_text(source.second_path);
  }
  if (!text) {
    PLOG(ERROR) << "cannot read "
                << (source.second_path != nullptr ? source.second_path : source.path);
  }
  return text;
}

bool load_source(const PropertySource& source) {
  const std::optional<std::string> text = read_source(source);
  if (!text) {
    return false;
  }
  const std::vector<Property> properties = parse_property_text(*text, source.path);
  if (properties.empty()) {
    LOG(ERROR) << source.path << ": there is no property";
    return false;
  }
  for (const Property& property : properties) {
    set_property(property, source);
  }
  if (source.working_copy != nullptr && !write_property_text(source.working_copy, *text)) {
    PLOG(ERROR) << "cannot write " << source.working_copy;
    return false;
  }
  return true;
}

void tell(const char* property, const char* value) {
  if (!SetProperty(property, value)) {
    PLOG(ERROR) << "cannot set " << property;
  }
}

void answer(const LoadRequest& load) {
  tell(load.completion, "0");
  tell(load.request, "0");
  for (const PropertySource& source : load.sources) {
    const bool ready = load_source(source);
    LOG(INFO) << load.request << ": " << source.ready << " is " << (ready ? "true" : "false");
    tell(source.ready, ready ? "true" : "false");
  }
  tell(load.completion, "1");
}

}  // namespace

void answer_requests() {
  for (const LoadRequest& load : kRequests) {
    if (GetProperty(load.request, "") == "1") {
      answer(load);
    }
  }
}

void withdraw_answers() {
  for (const LoadRequest& load : kRequests) {
    tell(load.completion, "0");
  }
}

}  // namespace sentrova::device
