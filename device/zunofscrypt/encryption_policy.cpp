#include "device/zunofscrypt/encryption_policy.h"

#include <android-base/errno_restorer.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <stddef.h>
#include <string.h>
#include <sys/ioctl.h>

#include <algorithm>
#include <cerrno>

namespace sentrova {
namespace {

// Makes one request about a folder, with what it asks for in `argument`. Keeps `errno`.
bool request(const std::string& folder, unsigned long code, void* argument, const char* what,
             std::string& error) {
  const android::base::unique_fd fd(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (fd.ok() && ioctl(fd.get(), code, argument) == 0) {
    return true;
  }
  const android::base::ErrnoRestorer keep_errno;
  error = folder + ": " + what + ": " + strerror(errno);
  return false;
}

fscrypt_key_specifier specifier(const KeyIdentifier& identifier) {
  fscrypt_key_specifier result = {};
  result.type = FSCRYPT_KEY_SPEC_TYPE_IDENTIFIER;
  std::copy(identifier.begin(), identifier.end(), result.u.identifier);
  return result;
}

// The kernel's request ends in the key, so its room is a key's.
using AddKeyRequest = KeyBytes<sizeof(fscrypt_add_key_arg) + MasterKey::size()>;

}  // namespace

std::optional<KeyIdentifier> read_policy(const std::string& folder, std::string& error) {
  fscrypt_get_policy_ex_arg argument = {};
  argument.policy_size = sizeof(argument.policy);
  if (!request(folder, FS_IOC_GET_ENCRYPTION_POLICY_EX, &argument, "no encryption policy", error)) {
    return std::nullopt;
  }
  if (argument.policy.version != FSCRYPT_POLICY_V2) {
    error = folder + ": an encryption policy of another version";
    return std::nullopt;
  }
  return std::to_array(argument.policy.v2.master_key_identifier);
}

bool set_policy(const std::string& folder, const KeyIdentifier& identifier, std::string& error) {
  fscrypt_policy_v2 policy = {};
  policy.version = FSCRYPT_POLICY_V2;
  policy.contents_encryption_mode = FSCRYPT_MODE_AES_256_XTS;
  policy.filenames_encryption_mode = FSCRYPT_MODE_AES_256_CTS;
  policy.flags = FSCRYPT_POLICY_FLAGS_PAD_16;
  std::copy(identifier.begin(), identifier.end(), policy.master_key_identifier);
  return request(folder, FS_IOC_SET_ENCRYPTION_POLICY, &policy, "cannot set the encryption policy",
                 error);
}

std::optional<KeyIdentifier> add_key(const std::string& mount_point, const MasterKey& key,
                                     std::string& error) {
  AddKeyRequest bytes;
  fscrypt_add_key_arg argument = {};
  argument.key_spec.type = FSCRYPT_KEY_SPEC_TYPE_IDENTIFIER;
  argument.raw_size = MasterKey::size();
  memcpy(bytes.data(), &argument, sizeof(argument));
  memcpy(bytes.data() + sizeof(argument), key.data(), MasterKey::size());
  if (!request(mount_point, FS_IOC_ADD_ENCRYPTION_KEY, bytes.data(), "the kernel takes no key",
               error)) {
    return std::nullopt;
  }
  memcpy(&argument, bytes.data(), sizeof(argument));
  return std::to_array(argument.key_spec.u.identifier);
}

std::optional<bool> has_key(const std::string& mount_point, const KeyIdentifier& identifier,
                            std::string& error) {
  fscrypt_get_key_status_arg argument = {};
  argument.key_spec = specifier(identifier);
  if (!request(mount_point, FS_IOC_GET_ENCRYPTION_KEY_STATUS, &argument,
               "the kernel does not tell about a key", error)) {
    return std::nullopt;
  }
  return argument.status == FSCRYPT_KEY_STATUS_PRESENT;
}

bool remove_key(const std::string& mount_point, const KeyIdentifier& identifier,
                std::string& error) {
  fscrypt_remove_key_arg argument = {};
  argument.key_spec = specifier(identifier);
  if (!request(mount_point, FS_IOC_REMOVE_ENCRYPTION_KEY, &argument, "the key stays", error)) {
    return errno == ENOKEY;  // there is none
  }
  if ((argument.removal_status_flags & FSCRYPT_KEY_REMOVAL_STATUS_FLAG_FILES_BUSY) != 0) {
    error = mount_point + ": files are busy";
    return false;
  }
  if ((argument.removal_status_flags & FSCRYPT_KEY_REMOVAL_STATUS_FLAG_OTHER_USERS) != 0) {
    error = mount_point + ": other users have added the key as well";
    return false;
  }
  return true;
}

}  // namespace sentrova
