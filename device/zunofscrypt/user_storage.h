#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "device/zunofscrypt/encryption_policy.h"
#include "device/zunofscrypt/key_bytes.h"
#include "device/zunofscrypt/places.h"

namespace sentrova {

// The steps of unlocking files on mounted user data. All return false with the reason in `error`.
// Not for two threads at once.

// Gives the kernel the key of these folders. Where it belongs to one of them only, or to none, the
// kernel is left as it was. A folder that is missing does not keep the others locked; at least one
// must be there. Succeeds also where the key is there already.
bool unlock_folders(const std::string& mount_point, const std::vector<std::string>& folders,
                    const MasterKey& key, std::string& error);

// Takes the key of these folders away. Succeeds where it is not there; fails while files below them
// are open.
bool lock_folders(const std::string& mount_point, const std::vector<std::string>& folders,
                  std::string& error);

// Unlocks the device-encrypted storage with the key that is wrapped under the device's secret.
bool unlock_device_encrypted(const Places& places, std::string& error);

// Unlocks a user's credential-encrypted storage, whose key lies in the device-encrypted one. A
// wrong secret fails also where the storage is unlocked.
bool unlock_credential_encrypted(const Places& places, int user_id, std::string_view secret,
                                 std::string& error);

}  // namespace sentrova
