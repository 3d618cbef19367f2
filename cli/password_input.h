#pragma once

#include <string>

namespace sentrova {

// The longest password that is read, in bytes: well above any credential, well below what a
// transaction can carry.
inline constexpr size_t kMaxPasswordBytes = 64 * 1024;

struct PasswordInput {
  std::string password;  // the receiver wipes it
  std::string error;     // empty when the password can be used
};

// Asks for a password with `prompt`, without echo, on the controlling terminal where standard input
// is a terminal, and otherwise reads the first line of standard input. The line end is not part of
// the password. An input that ends early, is too long, holds a NUL character or is not UTF-8 is an
// error.
PasswordInput read_password(const char* prompt);

// The second half of read_password: reads one line from the descriptor `fd`, which stays the
// caller's. Reads no further than the line's end.
PasswordInput read_password_line(int fd);

}  // namespace sentrova
