#include "tests/support/fake_credential_library.h"

#include <zunogatekeeper.h>

#include <algorithm>
#include <string>

namespace {

// Looks at storage that no constructor has run on yet. Called through a volatile pointer, so that
// the compiler does not reason about bytes that a constructor would find undefined.
bool all_zero(const void* storage, size_t size) {
  const auto* bytes = static_cast<const volatile unsigned char*>(storage);
  return std::all_of(bytes, bytes + size, [](unsigned char byte) { return byte == 0; });
}

bool (*volatile const look_at_storage)(const void*, size_t) = all_zero;

// The members' order is told by their addresses: 1 for the first, 2 for the later one.
const void* current_manager = nullptr;

}  // namespace

FakeCredentialLibrary& FakeCredentialLibrary::instance() {
  static FakeCredentialLibrary library;
  return library;
}

ZunoGuardManager::ZunoGuardManager(int userId) {
  FakeCredentialLibrary& library = FakeCredentialLibrary::instance();
  library.storage_was_zero = look_at_storage(this, sizeof(*this));
  current_manager = this;
  library.on_call("manager " + std::to_string(userId));
}

int ZunoGuardManager::getLockStatus() {
  FakeCredentialLibrary::instance().on_call("status");
  return FakeCredentialLibrary::instance().lock_status;
}

bool ZunoGuardManager::verifyPassword(std::string password) {
  FakeCredentialLibrary::instance().on_call("verify " + password);
  return FakeCredentialLibrary::instance().matches(password);
}

LockSettingsStorage::~LockSettingsStorage() {
  const bool is_first = static_cast<const void*>(this) == current_manager;
  FakeCredentialLibrary::instance().on_call(is_first ? "storage gone 1" : "storage gone 2");
}
