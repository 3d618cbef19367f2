#include <android-base/properties.h>
#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <linux/fs.h>
#include <stdint.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cmath>

#include "toolkit/log_tag.h"
#include "toolkit/whole_sleep.h"
#include "toolkit/zuno_func.h"

using android::base::GetProperty;
using android::base::SetProperty;
using android::base::unique_fd;
using sentrova::toolkit::kLogTag;

namespace {

constexpr useconds_t kPerformanceModeMicroseconds = 500'000;
constexpr useconds_t kPollMicroseconds = 100'000;
constexpr double kPollMilliseconds = 100;
constexpr double kMostPolls = 1e15;  // three million years; keeps the count within its type

// BLKGETSIZE counts in sectors of 512 bytes, whatever the device's own are.
constexpr int kSectorShift = 9;

// Returns the number of looks that fit in the time, at least one.
int64_t poll_count(double timeout_seconds) {
  const double polls = std::trunc(timeout_seconds * 1000 / kPollMilliseconds);
  // Written so that a time-out that is not a number gives one look.
  return polls > 1 ? static_cast<int64_t>(std::min(polls, kMostPolls)) : 1;
}

template <typename Condition>
bool poll_until(Condition condition, double timeout_seconds) {
  for (int64_t left = poll_count(timeout_seconds); left > 0; --left) {
    // Before the first look too: a request made just now is given time to take effect.
    sentrova::toolkit::sleep_whole(std::chrono::microseconds(kPollMicroseconds),
                                   [] { usleep(kPollMicroseconds); });
    if (condition()) {
      return true;
    }
  }
  return false;
}

}  // namespace

int ZunoFunc::SetPerformanceMode(bool on) {
  SetProperty("recovery.perf.mode", on ? "1" : "0");
  return usleep(kPerformanceModeMicroseconds);
}

bool ZunoFunc::Is_Eng_Build() {
  return GetProperty("ro.build.type", "") == "eng";
}

bool ZunoFunc::wait_for_property(std::string name, std::string value, double timeout_seconds) {
  return !name.empty() &&
         poll_until([&] { return GetProperty(name, "") == value; }, timeout_seconds);
}

bool ZunoFunc::wait_for_block_device(std::string path, double timeout_seconds) {
  struct stat status;
  return !path.empty() &&
         poll_until([&] { return stat(path.c_str(), &status) == 0; }, timeout_seconds);
}

bool ZunoFunc::Get_Blk_Device_Size(std::string path, unsigned long long& total,
                                   unsigned long long& free, unsigned long long& available) {
  total = free = available = 0;
  if (!Path_Exists(path)) {
    // Field tools look for "not exit".
    fprintf(stdout, "[%s]I: block device '%s' not exit(%s)\n", kLogTag, path.c_str(),
            strerror(errno));
    return false;
  }
  struct statfs status;
  if (statfs(path.c_str(), &status) != 0) {
    fprintf(stdout, "[%s]I: statfs block device '%s' fail(%s)\n", kLogTag, path.c_str(),
            strerror(errno));
    return false;
  }
  const auto block_size = static_cast<unsigned long long>(status.f_bsize);
  total = status.f_blocks * block_size;
  free = status.f_bfree * block_size;
  available = status.f_bavail * block_size;
  return true;
}

unsigned long ZunoFunc::IOCTL_Get_Block_Size(const char* path) {
  const unique_fd device(open(path, O_RDONLY | O_CLOEXEC));
  if (device == -1) {
    fprintf(stdout, "[%s]I: Find_Partition_Size: Failed to open '%s', (%s)\n", kLogTag, path,
            strerror(errno));
    return 0;
  }
  unsigned long sectors = 0;
  if (ioctl(device.get(), BLKGETSIZE, &sectors) != 0) {
    fprintf(stdout, "[%s]I: Find_Partition_Size: ioctl error: (%s)\n", kLogTag, strerror(errno));
    return 0;
  }
  return sectors << kSectorShift;
}
