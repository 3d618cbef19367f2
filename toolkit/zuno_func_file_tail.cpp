#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <stdint.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <memory>
#include <new>

#include "toolkit/file_stream.h"
#include "toolkit/zuno_func.h"

using android::base::unique_fd;
using sentrova::toolkit::open_to_read;
using sentrova::toolkit::open_to_write;

namespace {

// The low 32 bits of the file's size, as a signed number: that larger files wrap is relied upon.
// -1 if `file` is not open or cannot seek.
int32_t wrapped_size(const unique_fd& file) {
  return static_cast<int32_t>(lseek(file.get(), 0, SEEK_END));
}

// Reads `count` bytes from `start` on. What the file does not yield reads as zeros, as callers rely
// on getting `count` bytes. Null if there is no memory for them.
std::unique_ptr<char[]> read_part(const unique_fd& file, int32_t start, size_t count) {
  std::unique_ptr<char[]> bytes(new (std::nothrow) char[count]());
  if (bytes != nullptr) {
    android::base::ReadFullyAtOffset(file, bytes.get(), count, start);
  }
  return bytes;
}

// Makes `path` a file of these bytes. A file that cannot be opened or written to is not reported.
void replace_contents(const std::string& path, const char* bytes, size_t count) {
  const unique_fd file = open_to_write(path, O_TRUNC);
  if (file.ok()) {
    android::base::WriteFully(file, bytes, count);
  }
}

}  // namespace

int ZunoFunc::copy_file_tail(std::string source, std::string destination, int max_bytes, int mode) {
  if (!Path_Exists(source) || max_bytes < 1) {
    return -1;
  }
  const unique_fd file = open_to_read(source);
  const int32_t size = wrapped_size(file);
  if (size < 1) {
    return -1;
  }
  const size_t count = static_cast<size_t>(std::min(size, max_bytes));
  const int32_t start = size > max_bytes ? size - max_bytes : 0;
  const std::unique_ptr<char[]> tail = read_part(file, start, count);
  if (tail == nullptr) {
    return -1;
  }
  replace_contents(destination, tail.get(), count);
  if (chmod(destination.c_str(), static_cast<mode_t>(mode)) != 0) {
    fprintf(stdout, "fail to chmod %s permission\n", destination.c_str());
  }
  return 0;
}

int ZunoFunc::resize_file(std::string path, int new_size, bool keep_head) {
  if (!Path_Exists(path) || new_size < 0) {
    return -1;
  }
  const unique_fd file = open_to_read(path);
  const int32_t size = wrapped_size(file);
  if (size <= new_size) {
    return -1;
  }
  const size_t count = static_cast<size_t>(new_size);
  const std::unique_ptr<char[]> kept = read_part(file, keep_head ? 0 : size - new_size, count);
  if (kept == nullptr) {
    return -1;
  }
  replace_contents(path, kept.get(), count);
  return 0;
}
