#pragma once

#include <functional>
#include <string>

// Takes the place of the closed credential library in a test program: answers as it is told. One
// script for the whole process; for tests on one thread.
struct FakeCredentialLibrary {
  int lock_status = 0;
  std::function<bool(const std::string&)> matches = [](const std::string&) { return false; };
  // Is told "manager 0", "status", "verify TEXT", "storage gone 2".
  std::function<void(const std::string& call)> on_call = [](const auto&) {};

  bool storage_was_zero = false;  // of the manager made last, when its constructor began

  static FakeCredentialLibrary& instance();
  void reset() { *this = FakeCredentialLibrary(); }
};
