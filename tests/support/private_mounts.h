#pragma once

#include <string>

namespace sentrova::testing {

// Gives this process a mount namespace and a root directory of its own: a tmpfs in which every
// entry of the old root appears again under its name, so that a test can make top-level directories
// such as /system and mount what it likes without a trace on the machine. The process stays there
// until it ends. Called again it does nothing. Returns an empty text, or why the machine refuses;
// then nothing has changed that a test could notice.
std::string enter_private_root();

// Makes /system/bin/sh the machine's shell unless it exists. Call it inside the private root.
// Returns whether /system/bin/sh can be executed.
bool provide_shell();

// A tmpfs over the directory `path`, which is made with its parents if it is absent, until
// destruction. Only inside the private root; aborts the test program if the kernel refuses.
class ScopedTmpfs {
 public:
  explicit ScopedTmpfs(std::string path);
  ~ScopedTmpfs();
  ScopedTmpfs(const ScopedTmpfs&) = delete;
  ScopedTmpfs& operator=(const ScopedTmpfs&) = delete;

 private:
  std::string path_;
};

}  // namespace sentrova::testing

// At the start of a test (or of SetUp) that needs the private root: skips it where there is none.
#define SKIP_WITHOUT_PRIVATE_ROOT()                                                            \
  if (const std::string refusal = ::sentrova::testing::enter_private_root(); !refusal.empty()) \
  GTEST_SKIP() << refusal
