#pragma once

#include <string>

#include "common/export.h"

class ZunoGuardManager;

// One source of lock-screen settings as the closed credential library keeps it inside a manager.
// Its content is the library's own; zero bytes mean that it holds nothing.
class SENTROVA_API LockSettingsStorage {
 public:
  // Gives back what the storage holds; nothing, where it is all zeros.
  ~LockSettingsStorage();
  LockSettingsStorage(const LockSettingsStorage&) = delete;
  LockSettingsStorage& operator=(const LockSettingsStorage&) = delete;

 private:
  friend class ZunoGuardManager;

  // Leaves the bytes as they are: whoever provides the room has filled it with zeros.
  LockSettingsStorage() = default;

  // Room reserved for the closed library.
  [[maybe_unused]] alignas(8) unsigned char reserved_[64];
};

// Answers for the lock-screen credential of one user. Provide zero-filled, suitably aligned storage
// and construct the manager in it. A manager is used by one thread; several managers may be used at
// once. There is no destructor of its own: the members' destructors run, the later member first.
class SENTROVA_API ZunoGuardManager {
 public:
  // Prepares to answer for the user of this number. Reads nothing yet and cannot fail.
  explicit ZunoGuardManager(int userId);
  ZunoGuardManager(const ZunoGuardManager&) = delete;
  ZunoGuardManager& operator=(const ZunoGuardManager&) = delete;

  // Returns the kind of credential that the user has set: 0 none, 1 to 5 a kind that the credential
  // library and its clients agree on, anything else (negative included) unknown.
  int getLockStatus();

  // Returns true if `password` is the user's credential; false if it is not, if none is set, or if
  // the stored credential cannot be read. The copy that is passed is wiped.
  bool verifyPassword(std::string password);

 private:
  LockSettingsStorage settings_;
  LockSettingsStorage shared_settings_;
};
