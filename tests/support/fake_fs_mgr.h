#pragma once

#include <fs_mgr_dm_linear.h>
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
  // These too. The second argument is the path; the third the mount point, empty for the row's own.
  std::function<bool(android::fs_mgr::Fstab*, const std::string&, const std::string&)>
      ensure_mounted = [](auto*, const auto&, const auto&) { return false; };
  std::function<bool(android::fs_mgr::Fstab*, const std::string&)> ensure_unmounted =
      [](auto*, const auto&) { return false; };
  // The node of a logical partition that is mapped, "" for a failure.
  std::function<std::string(const android::fs_mgr::CreateLogicalPartitionParams&)> create_logical =
      [](const auto&) { return ""; };
  std::string system_root = "/system";
  std::string slot_suffix;
  std::string super_partition_name = "super";

  // "read fstab", "mount /dev/block/x at /data", "ensure mounted /data/x at /mnt", "ensure
  // unmounted /data", "super partition of slot -1", "create x_a from /dev/block/y, table 0,
  // writable, 1000 ms", "destroy x_a". The fake device mapper and the kernel script
  // add theirs, so that the order of all shows.
  std::vector<std::string> calls;

  static FakeFsMgr& instance();
  void reset() { *this = FakeFsMgr(); }
};

namespace sentrova::testing {

// Returns a row with these three fields, the rest as the platform has it.
android::fs_mgr::FstabEntry fstab_row(const std::string& block_device,
                                      const std::string& mount_point,
                                      const std::string& file_system = "ext4");

}  // namespace sentrova::testing
