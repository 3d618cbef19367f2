#pragma once

#include <stdint.h>

#include <functional>
#include <vector>

namespace sentrova::testing {

// A test program that links this has its own sleep() and usleep(), which the code under test calls.
// While a script is alive they return 0 at once and are noted in it; otherwise they sleep. One
// script at a time. Sleeps may come from any thread.
class SleepScript {
 public:
  // `on_sleep` runs in each sleep, on the thread that sleeps, after the sleep is noted: it stands
  // for what the world does meanwhile. Its argument is the number of sleeps so far, this one
  // included.
  explicit SleepScript(std::function<void(size_t)> on_sleep = [](size_t) {});
  ~SleepScript();
  SleepScript(const SleepScript&) = delete;
  SleepScript& operator=(const SleepScript&) = delete;

  // The lengths of the sleeps so far, in order.
  std::vector<int64_t> microseconds() const;

  // Called by sleep() and usleep(). Returns whether a script took the sleep.
  static bool take_sleep(int64_t microseconds);

 private:
  std::function<void(size_t)> on_sleep_;
  std::vector<int64_t> microseconds_;
};

}  // namespace sentrova::testing
