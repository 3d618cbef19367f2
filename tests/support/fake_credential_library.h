#pragma once

#include <functional>
#include <string>
#include <vector>

// Takes the place of the closed credential library in a test program: answers as it is told and
// remembers what it was asked. One script for the whole process; calls may come from any thread
// only while no test changes it.
struct FakeCredentialLibrary {
  int lock_status = 0;
  std::function<bool(const std::string&)> matches = [](const std::string&) { return false; };
  bool recording = true;
  std::function<void(const std::string& call)> on_call = [](const auto&) {};  // while recording

  std::vector<std::string> calls;  // "manager 0", "status", "verify TEXT", "storage gone 2"
  bool storage_was_zero = false;   // of the manager made last, when its constructor began

  static FakeCredentialLibrary& instance();
  void reset() { *this = FakeCredentialLibrary(); }

  // Without recording nothing is written or allocated here, so that threads may call at once.
  void record(const char* call, const std::string& detail = "") {
    if (recording) {
      calls.push_back(call + detail);
      on_call(calls.back());
    }
  }
};
