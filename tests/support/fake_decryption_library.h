#pragma once

#include <functional>
#include <string>

// Takes the place of the closed decryption library in a test program: answers as it is told. One
// script for the whole process; for tests on one thread.
struct FakeDecryptionLibrary {
  std::function<bool()> metadata = [] { return true; };
  std::function<bool()> device_encrypted = [] { return true; };
  std::function<bool(int user_id, const std::string& secret, bool flag)> user =
      [](int, const std::string&, bool) { return true; };

  static FakeDecryptionLibrary& instance();
  void reset() { *this = FakeDecryptionLibrary(); }
};
