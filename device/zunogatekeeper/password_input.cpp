#include "device/zunogatekeeper/password_input.h"

#include <unistd.h>

#include <cerrno>

namespace sentrova {

bool read_password(int fd, std::string& password) {
  password.reserve(kMaxPasswordBytes);  // or growth would leave copies behind
  char byte = 0;
  for (;;) {
    const ssize_t length = read(fd, &byte, 1);
    if (length < 0 && errno == EINTR) {
      continue;
    }
    if (length < 0) {
      return false;
    }
    if (length == 0 || byte == '\n') {
      return !password.empty();
    }
    if (byte == '\0' || password.size() == kMaxPasswordBytes) {
      return false;
    }
    password.push_back(byte);
  }
}

}  // namespace sentrova
