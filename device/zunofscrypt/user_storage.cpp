#include "device/zunofscrypt/user_storage.h"

#include <unistd.h>

#include <optional>

#include "device/zunofscrypt/key_file.h"
#include "device/zunofscrypt/wrapped_key.h"

namespace sentrova {
namespace {

// The identifier in the policies of those folders that are there; they must agree.
std::optional<KeyIdentifier> common_identifier(const std::vector<std::string>& folders,
                                               std::string& error) {
  std::optional<KeyIdentifier> common;
  for (const std::string& folder : folders) {
    if (access(folder.c_str(), F_OK) != 0) {
      continue;
    }
    const std::optional<KeyIdentifier> identifier = read_policy(folder, error);
    if (!identifier) {
      return std::nullopt;
    }
    if (common && *common != *identifier) {
      error = folder + ": encrypted under another key than the folders beside it";
      return std::nullopt;
    }
    common = identifier;
  }
  if (!common) {
    error = folders.front() + ": there is no such folder, nor those that go with it";
  }
  return common;
}

// Reading the key of the credential-encrypted storage would only say that there is no such file.
bool is_device_encrypted_storage_open(const Places& places, std::string& error) {
  const std::optional<KeyIdentifier> identifier = common_identifier(places.de_folders(), error);
  const std::optional<bool> open =
      identifier ? has_key(places.data, *identifier, error) : std::nullopt;
  if (open && !*open) {
    error = "the device-encrypted storage is locked";
  }
  return open.value_or(false);
}

}  // namespace

bool unlock_folders(const std::string& mount_point, const std::vector<std::string>& folders,
                    const MasterKey& key, std::string& error) {
  const std::optional<KeyIdentifier> wanted = common_identifier(folders, error);
  const std::optional<KeyIdentifier> added =
      wanted ? add_key(mount_point, key, error) : std::nullopt;
  if (!added) {
    return false;
  }
  if (*added == *wanted) {
    return true;
  }
  std::string ignored;  // nothing can be open under a key that no folder has
  remove_key(mount_point, *added, ignored);
  error = folders.front() + ": the key is another folder's";
  return false;
}

bool lock_folders(const std::string& mount_point, const std::vector<std::string>& folders,
                  std::string& error) {
  const std::optional<KeyIdentifier> identifier = common_identifier(folders, error);
  return identifier && remove_key(mount_point, *identifier, error);
}

bool unlock_device_encrypted(const Places& places, std::string& error) {
  const std::optional<WrappedKey> wrapped = read_key_file(places.de_key(), error);
  const std::optional<WrappingKey> secret =
      wrapped ? read_secret_file(places.device_secret(), error) : std::nullopt;
  const std::optional<MasterKey> key =
      secret ? unwrap_with_device_secret(*wrapped, *secret, kDePurpose, error) : std::nullopt;
  return key && unlock_folders(places.data, places.de_folders(), *key, error);
}

bool unlock_credential_encrypted(const Places& places, int user_id, std::string_view secret,
                                 std::string& error) {
  const std::optional<WrappedKey> wrapped = is_device_encrypted_storage_open(places, error)
                                                ? read_key_file(places.ce_key(user_id), error)
                                                : std::nullopt;
  const std::optional<MasterKey> key =
      wrapped ? unwrap_with_credential(*wrapped, secret, ce_purpose(user_id), error) : std::nullopt;
  return key && unlock_folders(places.data, places.ce_folders(user_id), *key, error);
}

}  // namespace sentrova
