#pragma once

#include <android-base/unique_fd.h>

namespace sentrova {

// While one is alive, what the library writes to standard output goes to standard error, so that
// standard output holds the answer alone. Where nobody reads them any more they are lost, and the
// work goes on. One at a time, while no other thread writes there.
class LibraryMessagesToStderr {
 public:
  LibraryMessagesToStderr();
  ~LibraryMessagesToStderr();
  LibraryMessagesToStderr(const LibraryMessagesToStderr&) = delete;
  LibraryMessagesToStderr& operator=(const LibraryMessagesToStderr&) = delete;

 private:
  android::base::unique_fd original_;
  void (*pipe_signal_action_)(int);
};

}  // namespace sentrova
