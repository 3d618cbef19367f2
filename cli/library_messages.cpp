#include "cli/library_messages.h"

#include <fcntl.h>
#include <signal.h>
#include <unistd.h>

#include <cstdio>

namespace sentrova {

// The formatting tools inherit that SIGPIPE is ignored: they are not to end half-way, either.
LibraryMessagesToStderr::LibraryMessagesToStderr() : pipe_signal_action_(signal(SIGPIPE, SIG_IGN)) {
  fflush(stdout);
  original_.reset(fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, STDERR_FILENO + 1));
  dup2(STDERR_FILENO, STDOUT_FILENO);
}

LibraryMessagesToStderr::~LibraryMessagesToStderr() {
  fflush(stdout);
  clearerr(stdout);  // a message that could not be written does not count against the answer
  dup2(original_.get(), STDOUT_FILENO);
  signal(SIGPIPE, pipe_signal_action_);
}

}  // namespace sentrova
