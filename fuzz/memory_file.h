#pragma once

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <sys/mman.h>
#include <unistd.h>

#include <string>

// A file that is only in memory, for code that reads files by their paths.
class MemoryFile {
 public:
  explicit MemoryFile(const std::string& content) : file_(memfd_create("input", MFD_CLOEXEC)) {
    CHECK(android::base::WriteStringToFd(content, file_.get()));
  }

  std::string path() const { return "/proc/self/fd/" + std::to_string(file_.get()); }

 private:
  android::base::unique_fd file_;
};
