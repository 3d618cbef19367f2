#pragma once

#include <unistd.h>

#include <cerrno>
#include <chrono>

namespace sentrova::toolkit {

// Calls `sleep_once`, which sleeps for `duration`; when a signal handler ends that early, sleeps
// the rest too. Without this, a host that handles signals would cut every time-out short. Keeps
// `errno`.
template <typename SleepOnce>
void sleep_whole(std::chrono::microseconds duration, SleepOnce sleep_once) {
  using std::chrono::steady_clock;
  const int saved_errno = errno;
  const steady_clock::time_point end = steady_clock::now() + duration;
  errno = 0;
  sleep_once();
  while (errno == EINTR) {
    const auto left = std::chrono::ceil<std::chrono::microseconds>(end - steady_clock::now());
    errno = 0;
    if (left.count() > 0) {
      usleep(static_cast<useconds_t>(left.count()));
    }
  }
  errno = saved_errno;
}

}  // namespace sentrova::toolkit
