#include <android-base/logging.h>
#include <android-base/properties.h>
#include <fs_mgr/roots.h>
#include <zunofscrypt.h>

#include <chrono>
#include <functional>
#include <mutex>

#include "device/zunofscrypt/metadata_encryption.h"
#include "device/zunofscrypt/user_storage.h"

namespace {

using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using sentrova::Places;

// Tells the rest of the rescue environment to look for the user data behind the dm-crypt device.
constexpr char kMetadataEnabledProperty[] = "ro.crypto.metadata.enabled";

// Runs one step, no two at the same time, and logs how it ended and how long it took, so that the
// rest of an unlock can be told from it.
bool run_step(const char* name, const std::function<bool(std::string& error)>& step) {
  static std::mutex turn;
  const std::lock_guard<std::mutex> lock(turn);
  const auto begin = std::chrono::steady_clock::now();
  std::string error;
  const bool done = step(error);
  const auto taken = std::chrono::duration_cast<std::chrono::microseconds>(
      std::chrono::steady_clock::now() - begin);
  LOG(INFO) << name << " took " << taken.count() << " us";
  if (!done) {
    LOG(ERROR) << name << ": " << error;
  }
  return done;
}

// Reads the fstab and mounts the metadata partition, where the keys are, if it has one.
bool prepare(const Places& places, Fstab& fstab, std::string& error) {
  if (!android::fs_mgr::ReadDefaultFstab(&fstab)) {
    error = "cannot read the fstab";
    return false;
  }
  const FstabEntry* const row = android::fs_mgr::GetEntryForMountPoint(&fstab, places.metadata);
  if (row != nullptr && !android::fs_mgr::EnsurePathMounted(&fstab, places.metadata)) {
    error = "cannot mount " + places.metadata;
    return false;
  }
  return true;
}

bool decrypt_metadata(std::string& error) {
  const Places places;
  Fstab fstab;
  if (!prepare(places, fstab, error)) {
    return false;
  }
  const FstabEntry* const row = android::fs_mgr::GetEntryForMountPoint(&fstab, places.data);
  if (row == nullptr) {
    error = "the fstab has no row for " + places.data;
    return false;
  }
  if (!sentrova::unlock_metadata(places, *row, error)) {
    return false;
  }
  android::base::SetProperty(kMetadataEnabledProperty, "true");
  return true;
}

}  // namespace

bool Decrypt_ME() {
  return run_step("Decrypt_ME", decrypt_metadata);
}

bool Decrypt_DE() {
  return run_step("Decrypt_DE", [](std::string& error) {
    const Places places;
    Fstab fstab;
    return prepare(places, fstab, error) && sentrova::unlock_device_encrypted(places, error);
  });
}

// The stand-in has no use for the flag.
bool Decrypt_User(int userId, const std::string& secret, bool /*flag*/) {
  return run_step("Decrypt_User", [userId, &secret](std::string& error) {
    return sentrova::unlock_credential_encrypted(Places(), userId, secret, error);
  });
}
