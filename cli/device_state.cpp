#include "cli/device_state.h"

#include <android-base/properties.h>
#include <mntent.h>

#include <memory>
#include <nlohmann/json.hpp>

namespace sentrova {
namespace {

constexpr char kDataMountPoint[] = "/data";

// Of several mounts on one another the last, which hides the others.
std::optional<DataMount> find_data_mount() {
  std::optional<DataMount> found;
  const std::unique_ptr<FILE, int (*)(FILE*)> mounts(setmntent("/proc/self/mounts", "re"),
                                                     endmntent);
  while (mounts != nullptr) {
    const mntent* mount = getmntent(mounts.get());
    if (mount == nullptr) {
      break;
    }
    if (mount->mnt_dir == std::string(kDataMountPoint)) {
      found = {
          .device = mount->mnt_fsname, .file_system = mount->mnt_type, .options = mount->mnt_opts};
    }
  }
  return found;
}

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
          .data = find_data_mount()};
}

std::string describe_data(const DeviceState& state) {
  return state.data ? state.data->file_system + " on " + state.data->device : "nothing is mounted";
}

nlohmann::json or_null(const std::string& property) {
  return property.empty() ? nlohmann::json() : nlohmann::json(property);
}

nlohmann::json data_as_json(const DeviceState& state) {
  if (!state.data) {
    return nullptr;
  }
  return {{"device", state.data->device},
          {"file_system", state.data->file_system},
          {"options", state.data->options}};
}

}  // namespace sentrova
