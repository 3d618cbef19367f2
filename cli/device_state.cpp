#include "cli/device_state.h"

#include <android-base/properties.h>

#include <nlohmann/json.hpp>

namespace sentrova {
namespace {

std::optional<bool> find_bool_property(const char* name) {
  const bool value = android::base::GetBoolProperty(name, false);
  return value == android::base::GetBoolProperty(name, true) ? std::optional(value) : std::nullopt;
}

}  // namespace

DeviceState read_device_state() {
  return {.crypto_type = android::base::GetProperty("ro.crypto.type", ""),
          .crypto_state = android::base::GetProperty("ro.crypto.state", ""),
          .decrypt_result = android::base::GetProperty("recovery.crypto.decrypt.result", ""),
          .metadata_encryption = find_bool_property("ro.crypto.metadata.enabled"),
          .data = find_mount("/data")};
}

std::string describe_data(const DeviceState& state) {
  return state.data ? state.data->file_system + " on " + state.data->device : "nothing is mounted";
}

nlohmann::json or_null(const std::string& property) {
  return property.empty() ? nlohmann::json() : nlohmann::json(property);
}

}  // namespace sentrova
