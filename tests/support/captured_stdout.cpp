#include "tests/support/captured_stdout.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <fcntl.h>
#include <stdio.h>
#include <sys/mman.h>
#include <unistd.h>

namespace sentrova::testing {

CapturedStdout::CapturedStdout()
    : original_(fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, STDERR_FILENO + 1)),
      capture_(memfd_create("stdout", MFD_CLOEXEC)) {
  fflush(stdout);
  CHECK(original_ != -1 && capture_ != -1 && dup2(capture_.get(), STDOUT_FILENO) != -1);
}

CapturedStdout::~CapturedStdout() {
  restore();
}

std::string CapturedStdout::take() {
  restore();
  std::string text;
  CHECK(lseek(capture_.get(), 0, SEEK_SET) == 0);
  CHECK(android::base::ReadFdToString(capture_.get(), &text));
  return text;
}

void CapturedStdout::restore() {
  if (original_ != -1) {
    fflush(stdout);
    CHECK(dup2(original_.get(), STDOUT_FILENO) != -1);
    original_.reset();
  }
}

}  // namespace sentrova::testing
