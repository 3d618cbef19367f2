#pragma once

#include <string.h>

#include <string>

namespace sentrova {

// Overwrites the room of a secret with zeros in a way that the compiler keeps, and empties it. All
// of the room: a string that was moved from is empty, and a short one still holds its characters.
inline void wipe(std::string& secret) {
  secret.resize(secret.capacity());
  explicit_bzero(secret.data(), secret.size());
  secret.clear();
}

// Wipes a secret when it goes out of scope. The secret is the caller's and must outlive the guard.
class WipeOnExit {
 public:
  explicit WipeOnExit(std::string& secret) : secret_(secret) {}
  ~WipeOnExit() { wipe(secret_); }
  WipeOnExit(const WipeOnExit&) = delete;
  WipeOnExit& operator=(const WipeOnExit&) = delete;

 private:
  std::string& secret_;
};

}  // namespace sentrova
