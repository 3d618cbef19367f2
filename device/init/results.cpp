#include "device/init/results.h"

#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <stdio.h>
#include <sys/klog.h>
#include <unistd.h>

namespace sentrova::device {
namespace {

// Actions of syslog(2).
constexpr int kReadAll = 3;
constexpr int kBufferSize = 10;

}  // namespace

bool save_kernel_log(const std::string& path) {
  const int capacity_bytes = klogctl(kBufferSize, nullptr, 0);
  if (capacity_bytes < 0) {
    return false;
  }
  std::string log(static_cast<size_t>(capacity_bytes), '\0');
  const int length_bytes = klogctl(kReadAll, log.data(), capacity_bytes);
  if (length_bytes < 0) {
    return false;
  }
  log.resize(static_cast<size_t>(length_bytes));
  return android::base::WriteStringToFile(log, path);
}

bool publish(const std::string& path, const std::string& text) {
  const std::string draft = path + ".new";
  return android::base::WriteStringToFile(text, draft) && rename(draft.c_str(), path.c_str()) == 0;
}

}  // namespace sentrova::device
