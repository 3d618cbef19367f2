#pragma once

#include <fstab/fstab.h>

#include <functional>
#include <string>
#include <vector>

// Takes the place of those of the platform's volume functions that reach outside the process:
// answers as it is told and remembers what it was asked. Look-ups in a table stay the platform's.
// One script for the whole process; for tests on one thread.
struct FakeFsMgr {
  std::function<bool(android::fs_mgr::Fstab*)> read_default_fstab = [](auto*) { return false; };
  // Sets `errno` as the platform's would.
  std::function<int(const android::fs_mgr::FstabEntry&)> mount_one = [](const auto&) { return -1; };
  std::string system_root = "/system";

  std::vector<std::string> calls;  // "read fstab", "mount /dev/block/x at /data"

  static FakeFsMgr& instance();
  void reset() { *this = FakeFsMgr(); }
};

namespace sentrova::testing {

// Returns a row with these three fields, the rest as the platform has it.
android::fs_mgr::FstabEntry fstab_row(const std::string& block_device,
                                      const std::string& mount_point,
                                      const std::string& file_system = "ext4");

}  // namespace sentrova::testing
