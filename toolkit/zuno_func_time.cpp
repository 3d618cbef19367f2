#include <android-base/stringprintf.h>
#include <stdint.h>

#include "toolkit/zuno_func.h"

namespace {

constexpr long kNanosecondsPerSecond = 1'000'000'000;
constexpr long kNanosecondsPerMillisecond = 1'000'000;

// Returns the milliseconds of `time` modulo 2^32.
uint32_t milliseconds(const timespec& time) {
  return static_cast<uint32_t>(time.tv_sec) * 1000 +
         static_cast<uint32_t>(time.tv_nsec / kNanosecondsPerMillisecond);
}

}  // namespace

timespec ZunoFunc::timespec_diff(timespec& start, timespec& end) {
  timespec difference = {.tv_sec = end.tv_sec - start.tv_sec,
                         .tv_nsec = end.tv_nsec - start.tv_nsec};
  if (difference.tv_nsec < 0) {
    --difference.tv_sec;
    difference.tv_nsec += kNanosecondsPerSecond;
  }
  return difference;
}

int ZunoFunc::timespec_diff_ms(timespec& start, timespec& end) {
  return static_cast<int>(milliseconds(end) - milliseconds(start));
}

std::string ZunoFunc::Get_Current_Date() {
  const time_t now = time(nullptr);
  tm local = {};
  tzset();  // localtime_r by itself keeps the zone that the process started with
  localtime_r(&now, &local);
  return android::base::StringPrintf("%04d-%02d-%02d--%02d-%02d-%02d", local.tm_year + 1900,
                                     local.tm_mon + 1, local.tm_mday, local.tm_hour, local.tm_min,
                                     local.tm_sec);
}
