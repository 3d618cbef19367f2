#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

namespace sentrova::device {

// A program to start, by path, with its own name as the first argument.
struct Command {
  std::vector<std::string> arguments;
  // Where its output and errors go, appended. Its input is empty.
  std::string log_path;
  // When set, a terminal that is its input and output instead.
  std::string terminal_path;
};

// Starts the command in a session and process group of its own, with no signal blocked and the
// device's environment. The caller reaps it. Returns its process id, or -1 with `errno`.
pid_t start_process(const Command& command);

// How a process ended, as a shell tells it: its exit status, or 128 and the number of the signal.
int shell_status(int wait_status);

// How a process ended, in words for a log.
std::string describe_wait_status(int wait_status);

}  // namespace sentrova::device
