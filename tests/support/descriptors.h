#pragma once

#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <sys/resource.h>

#include <filesystem>
#include <iterator>

namespace sentrova::testing {

// Returns how many descriptors this process has open; one more, each time, for the look itself.
inline std::ptrdiff_t count_descriptors() {
  const std::filesystem::directory_iterator descriptors("/proc/self/fd");
  return std::distance(begin(descriptors), end(descriptors));
}

// Lowers this process's limit on open descriptors to those open now and `spare` more, until
// destruction. Exact where the open descriptors have no gaps: the limit is on their numbers.
class DescriptorLimit {
 public:
  explicit DescriptorLimit(rlim_t spare) {
    const android::base::unique_fd lowest_free(open("/", O_PATH | O_CLOEXEC));
    getrlimit(RLIMIT_NOFILE, &before_);
    rlimit lowered = before_;
    lowered.rlim_cur = static_cast<rlim_t>(lowest_free.get()) + spare;
    setrlimit(RLIMIT_NOFILE, &lowered);
  }
  ~DescriptorLimit() { setrlimit(RLIMIT_NOFILE, &before_); }
  DescriptorLimit(const DescriptorLimit&) = delete;
  DescriptorLimit& operator=(const DescriptorLimit&) = delete;

 private:
  rlimit before_{};
};

}  // namespace sentrova::testing
