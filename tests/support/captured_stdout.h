#pragma once

#include <android-base/unique_fd.h>

#include <string>

namespace sentrova::testing {

// Collects what this process and its children write to standard output, from construction until
// take() or destruction. One at a time; for tests on one thread.
class CapturedStdout {
 public:
  CapturedStdout();
  ~CapturedStdout();
  CapturedStdout(const CapturedStdout&) = delete;
  CapturedStdout& operator=(const CapturedStdout&) = delete;

  // Gives standard output back and returns what was written meanwhile.
  std::string take();

 private:
  void restore();

  android::base::unique_fd original_;
  android::base::unique_fd capture_;
};

}  // namespace sentrova::testing
