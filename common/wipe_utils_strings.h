#pragma once

#include <string.h>
#include <utils/String16.h>
#include <utils/String8.h>

namespace sentrova {

// Overwrites the characters of a platform string with zeros in place. The string must be the only
// owner of its characters (not a copy of another string, which would share them).
inline void wipe(const android::String8& secret) {
  explicit_bzero(const_cast<char*>(secret.string()), secret.size());
}

inline void wipe(const android::String16& secret) {
  explicit_bzero(const_cast<char16_t*>(secret.string()), secret.size() * sizeof(char16_t));
}

}  // namespace sentrova
