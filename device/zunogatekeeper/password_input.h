#pragma once

#include <stddef.h>

#include <string>

namespace sentrova {

inline constexpr size_t kMaxPasswordBytes = 1024;

// Reads the first line, without its end, into `password`, which is empty. Returns false if it is
// empty, too long or holds a NUL, or on a read error. Byte by byte: what follows the line stays
// unread, and no buffer keeps a copy. The caller wipes the password.
bool read_password(int fd, std::string& password);

}  // namespace sentrova
