#include "tests/support/sleep_script.h"

#include <android-base/logging.h>
#include <errno.h>
#include <time.h>
#include <unistd.h>

#include <mutex>
#include <utility>

#include "common/export.h"

namespace sentrova::testing {
namespace {

std::mutex script_mutex;
SleepScript* current_script = nullptr;  // guarded by script_mutex, as is what it notes

}  // namespace

SleepScript::SleepScript(std::function<void(size_t)> on_sleep) : on_sleep_(std::move(on_sleep)) {
  const std::lock_guard lock(script_mutex);
  CHECK(current_script == nullptr) << "one sleep script at a time";
  current_script = this;
}

SleepScript::~SleepScript() {
  const std::lock_guard lock(script_mutex);
  current_script = nullptr;
}

std::vector<int64_t> SleepScript::microseconds() const {
  const std::lock_guard lock(script_mutex);
  return microseconds_;
}

bool SleepScript::take_sleep(int64_t microseconds) {
  std::function<void(size_t)> on_sleep;
  size_t count;
  {
    const std::lock_guard lock(script_mutex);
    if (current_script == nullptr) {
      return false;
    }
    current_script->microseconds_.push_back(microseconds);
    count = current_script->microseconds_.size();
    on_sleep = current_script->on_sleep_;
  }
  on_sleep(count);
  return true;
}

}  // namespace sentrova::testing

namespace {

constexpr int64_t kMicrosecondsPerSecond = 1'000'000;

// Returns the microseconds left when a signal ended the sleep, else 0.
int64_t really_sleep(int64_t microseconds) {
  timespec request = {.tv_sec = static_cast<time_t>(microseconds / kMicrosecondsPerSecond),
                      .tv_nsec = static_cast<long>(microseconds % kMicrosecondsPerSecond) * 1000};
  timespec left = {};
  return nanosleep(&request, &left) == 0
             ? 0
             : left.tv_sec * kMicrosecondsPerSecond + left.tv_nsec / 1000;
}

}  // namespace

extern "C" SENTROVA_API unsigned int sleep(unsigned int seconds) {
  const int64_t microseconds = seconds * kMicrosecondsPerSecond;
  if (sentrova::testing::SleepScript::take_sleep(microseconds)) {
    return 0;
  }
  const int64_t left = really_sleep(microseconds);
  return static_cast<unsigned int>((left + kMicrosecondsPerSecond - 1) / kMicrosecondsPerSecond);
}

extern "C" SENTROVA_API int usleep(useconds_t microseconds) {
  if (sentrova::testing::SleepScript::take_sleep(microseconds)) {
    return 0;
  }
  if (really_sleep(microseconds) == 0) {
    return 0;
  }
  errno = EINTR;
  return -1;
}
