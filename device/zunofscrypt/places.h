#pragma once

#include <string>
#include <vector>

namespace sentrova {

// Where things are on the device: the mount points of its metadata and user data, and the name of
// the dm-crypt device through which encrypted user data is read. Tests have places of their own.
struct Places {
  std::string metadata = "/metadata";
  std::string data = "/data";
  std::string mapping = "userdata";

  // The device's own secret, 32 bytes, which a phone keeps in its security chip. The keys that
  // unlock without a credential are wrapped under it.
  std::string device_secret() const { return metadata + "/device_secret"; }

  // The key of the device-encrypted storage. It lies in the open part of the user data, beside a
  // file that shows that there is file-based encryption.
  std::string de_key() const { return data + "/unencrypted/key/wrapped_key"; }
  std::string key_version() const { return data + "/unencrypted/key/version"; }

  // The key of a user's credential-encrypted storage, itself in the device-encrypted storage.
  std::string ce_key(int user_id) const {
    return data + "/system_de/0/ce_key_" + std::to_string(user_id);
  }

  // The folders of the device-encrypted storage (user 0's, the only one that there is).
  std::vector<std::string> de_folders() const {
    return {data + "/system_de/0", data + "/user_de/0"};
  }

  // The folders of a user's credential-encrypted storage; photographs are in the last.
  std::vector<std::string> ce_folders(int user_id) const {
    const std::string user = std::to_string(user_id);
    return {data + "/system_ce/" + user, data + "/user/" + user, data + "/media/" + user};
  }
};

// What keys are wrapped for.
inline constexpr char kMetadataPurpose[] = "metadata encryption";
inline constexpr char kDePurpose[] = "device-encrypted storage";
inline constexpr char kFullDiskPurpose[] = "full-disk encryption";
inline std::string ce_purpose(int user_id) {
  return "credential-encrypted storage of user " + std::to_string(user_id);
}

}  // namespace sentrova
