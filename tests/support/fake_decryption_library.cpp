#include "tests/support/fake_decryption_library.h"

#include <zunofscrypt.h>

FakeDecryptionLibrary& FakeDecryptionLibrary::instance() {
  static FakeDecryptionLibrary library;
  return library;
}

bool Decrypt_ME() {
  return FakeDecryptionLibrary::instance().metadata();
}

bool Decrypt_DE() {
  return FakeDecryptionLibrary::instance().device_encrypted();
}

bool Decrypt_User(int userId, const std::string& secret, bool flag) {
  return FakeDecryptionLibrary::instance().user(userId, secret, flag);
}
