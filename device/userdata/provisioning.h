#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "device/zunofscrypt/places.h"

namespace sentrova {

enum class UserDataKind {
  kFileEncryptedWithMetadata,
  kFileEncrypted,
  kFullDiskEncrypted,
  kPlain,
};

// The kind of this name: "fbe-metadata", "fbe", "fde" or "plain".
std::optional<UserDataKind> parse_kind(std::string_view name);

struct UserDataRequest {
  UserDataKind kind = UserDataKind::kPlain;
  std::string file_system;  // "f2fs" or "ext4"
  std::string block_device = "/dev/block/by-name/userdata";
  // Where the photograph's digest and path go. They tell in plain text that there is one.
  std::string digest_file = "/metadata/photograph.sha256";
};

// The fstab with which the rescue environment finds user data of this kind.
std::string fstab_text(const Places& places, const UserDataRequest& request);

// Makes user data of this kind on the partition, in place of all that was there: the file system,
// storage of user 0 whose key `secret` wraps, sample files (sample_files.h). The keys that unlock
// without a secret, and the device's secret unless there is one, are put on the metadata partition,
// which is mounted. Nothing is mounted, mapped or unlocked afterwards. False, with the reason in
// `error`, where that fails; what was made by then stays on the partitions.
bool provision_user_data(const Places& places, const UserDataRequest& request,
                         std::string_view secret, std::string& error);

}  // namespace sentrova
