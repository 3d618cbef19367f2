#pragma once

#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>

#include "cli/mounts.h"

namespace sentrova {

// What the system properties and the kernel show about the user data, without the service.
struct DeviceState {
  std::string crypto_type;     // "ro.crypto.type": "file", "block" or empty
  std::string crypto_state;    // "ro.crypto.state": "encrypted" or empty
  std::string decrypt_result;  // "recovery.crypto.decrypt.result"; empty before an unlock
  std::optional<bool> metadata_encryption;  // "ro.crypto.metadata.enabled", if it is set
  std::optional<Mount> data;                // what is mounted at /data, if anything

  bool encrypted() const { return crypto_state == "encrypted"; }
};

DeviceState read_device_state();

// "f2fs on /dev/block/dm-0", or that nothing is mounted.
std::string describe_data(const DeviceState& state);

// A property's value, or null where it is not set.
nlohmann::json or_null(const std::string& property);

}  // namespace sentrova
