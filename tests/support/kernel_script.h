#pragma once

#include <functional>
#include <string>

#include "tests/support/sleep_script.h"

namespace sentrova::testing {

// While one is alive, nothing in the process mounts with mount(2), unmounts with umount(2) or
// sleeps: the script answers, and each call is noted in FakeFsMgr's calls as "mount(2) DEVICE on
// DIRECTORY as TYPE, FLAGS, DATA", "umount(2) DIRECTORY" or "sleep MICROSECONDS". Otherwise the
// kernel does it. One at a time; for tests on one thread.
class KernelScript {
 public:
  KernelScript();
  ~KernelScript();
  KernelScript(const KernelScript&) = delete;
  KernelScript& operator=(const KernelScript&) = delete;

  // The `errno` that a call fails with, or 0 for success, which leaves `errno` as it is.
  std::function<int(const std::string& device, const std::string& file_system)> mount_error =
      [](const auto&, const auto&) { return 0; };
  std::function<int(const std::string& directory)> umount_error = [](const auto&) { return 0; };

  // Stands for what the world does during a sleep; `count` is the sleeps so far, this one included.
  std::function<void(size_t count)> on_sleep = [](size_t) {};

 private:
  void note_sleep(size_t count);

  SleepScript sleeps_;
};

}  // namespace sentrova::testing
