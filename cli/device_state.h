#pragma once

#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>

namespace sentrova {

// One mounted file system, as a line of /proc/self/mounts tells it.
struct DataMount {
  std::string device;
  std::string file_system;
  std::string options;  // separated by commas
};

// What the system properties and the kernel show about the user data, without the service.
struct DeviceState {
  std::string crypto_type;     // "ro.crypto.type": "file", "block" or empty
  std::string crypto_state;    // "ro.crypto.state": "encrypted" or empty
  std::string decrypt_result;  // "recovery.crypto.decrypt.result"; empty before an unlock
  std::optional<bool> metadata_encryption;  // "ro.crypto.metadata.enabled", if it is set
  std::optional<DataMount> data;            // what is mounted at /data, if anything

  bool encrypted() const { return crypto_state == "encrypted"; }
};

DeviceState read_device_state();

// "f2fs on /dev/block/dm-0", or that nothing is mounted.
std::string describe_data(const DeviceState& state);

// A property's value, or null where it is not set.
nlohmann::json or_null(const std::string& property);

// {"device", "file_system", "options"}, or null where nothing is mounted.
nlohmann::json data_as_json(const DeviceState& state);

}  // namespace sentrova
