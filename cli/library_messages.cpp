#include "cli/library_messages.h"

#include <fcntl.h>
#include <unistd.h>

#include <cstdio>

namespace sentrova {

LibraryMessagesToStderr::LibraryMessagesToStderr() {
  fflush(stdout);
  original_.reset(fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, STDERR_FILENO + 1));
  dup2(STDERR_FILENO, STDOUT_FILENO);
}

LibraryMessagesToStderr::~LibraryMessagesToStderr() {
  fflush(stdout);
  dup2(original_.get(), STDOUT_FILENO);
}

}  // namespace sentrova
