#pragma once

#include <string.h>
#include <zunogatekeeper.h>

#include <cstddef>
#include <new>

namespace sentrova {

// The credential library's manager for the device's owner, who is user 0 whichever user a client
// names. The manager gets storage of its own, because the credential library relies on finding it
// zero-filled when the constructor runs.
class OwnerGuardManager {
 public:
  OwnerGuardManager() : manager_(*new (zero_filled(storage_)) ZunoGuardManager(kOwnerUserId)) {}
  ~OwnerGuardManager() { manager_.~ZunoGuardManager(); }
  OwnerGuardManager(const OwnerGuardManager&) = delete;
  OwnerGuardManager& operator=(const OwnerGuardManager&) = delete;

  ZunoGuardManager* operator->() { return &manager_; }

 private:
  static constexpr int kOwnerUserId = 0;
  using Storage = std::byte[sizeof(ZunoGuardManager)];

  // explicit_bzero because the compiler may drop other stores that precede a constructor.
  static void* zero_filled(Storage& storage) {
    explicit_bzero(storage, sizeof(storage));
    return storage;
  }

  alignas(ZunoGuardManager) Storage storage_;
  ZunoGuardManager& manager_;
};

}  // namespace sentrova
