#pragma once

#include <errno.h>
#include <unistd.h>

#include <optional>
#include <string>

namespace sentrova {

// Reads what stands from the position of `fd` to the end. Nothing, with `errno`, if that fails;
// EFBIG if it is more than `limit` bytes, as of a device that never ends.
inline std::optional<std::string> read_at_most(int fd, size_t limit) {
  std::string text;
  char buffer[16384];
  while (text.size() <= limit) {
    const ssize_t count = TEMP_FAILURE_RETRY(read(fd, buffer, sizeof(buffer)));
    if (count < 0) {
      return std::nullopt;
    }
    if (count == 0) {
      return text;
    }
    text.append(buffer, static_cast<size_t>(count));
  }
  errno = EFBIG;
  return std::nullopt;
}

}  // namespace sentrova
