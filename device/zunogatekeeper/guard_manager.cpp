#include <android-base/properties.h>
#include <openssl/crypto.h>
#include <stdint.h>
#include <stdio.h>
#include <string.h>
#include <zunogatekeeper.h>

#include <optional>

#include "common/wipe.h"
#include "device/zunogatekeeper/credential_store.h"

// What the stand-in keeps in a manager's first storage; its second stays zero.
namespace {

struct KeptSettings {
  int32_t user_id;
};

// Says on standard error why the credential is not to be had.
std::optional<sentrova::Credential> load_credential(int user_id) {
  const std::string path =
      android::base::GetProperty(sentrova::kStorePathProperty, sentrova::kDefaultStorePath);
  std::string error;
  std::optional<sentrova::Credential> credential = sentrova::read_credential(path, user_id, error);
  if (!credential) {
    fprintf(stderr, "zunogatekeeper: no credential for user %d from %s: %s\n", user_id,
            path.c_str(), error.c_str());
  }
  return credential;
}

int kept_user_id(const unsigned char* storage) {
  KeptSettings kept = {};
  memcpy(&kept, storage, sizeof(kept));
  return kept.user_id;
}

}  // namespace

LockSettingsStorage::~LockSettingsStorage() {
  OPENSSL_cleanse(reserved_, sizeof(reserved_));
}

ZunoGuardManager::ZunoGuardManager(int userId) : settings_(), shared_settings_() {
  static_assert(sizeof(KeptSettings) <= sizeof(settings_.reserved_));
  const KeptSettings kept = {.user_id = userId};
  memcpy(settings_.reserved_, &kept, sizeof(kept));
}

int ZunoGuardManager::getLockStatus() {
  const std::optional<sentrova::Credential> credential =
      load_credential(kept_user_id(settings_.reserved_));
  return credential ? credential->status : -1;
}

bool ZunoGuardManager::verifyPassword(std::string password) {
  const sentrova::WipeOnExit wipe_password(password);
  const std::optional<sentrova::Credential> credential =
      load_credential(kept_user_id(settings_.reserved_));
  // Without a credential there is nothing that a password could match, an empty one included.
  return credential && credential->status != sentrova::kNoCredential &&
         sentrova::has_digest(password, credential->salt, credential->cost, credential->digest);
}
