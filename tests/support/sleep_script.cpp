#include "tests/support/sleep_script.h"

#include <android-base/logging.h>
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

extern "C" SENTROVA_API unsigned int sleep(unsigned int seconds) {
  if (sentrova::testing::SleepScript::take_sleep(int64_t{seconds} * 1'000'000)) {
    return 0;
  }
  timespec left = {.tv_sec = seconds, .tv_nsec = 0};
  return nanosleep(&left, &left) == 0
             ? 0
             : static_cast<unsigned int>(left.tv_sec) + (left.tv_nsec != 0);
}

extern "C" SENTROVA_API int usleep(useconds_t microseconds) {
  if (sentrova::testing::SleepScript::take_sleep(microseconds)) {
    return 0;
  }
  const timespec request = {.tv_sec = microseconds / 1'000'000,
                            .tv_nsec = microseconds % 1'000'000 * 1000L};
  return nanosleep(&request, nullptr);
}
