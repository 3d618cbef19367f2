#pragma once

#include <fs_mgr_dm_linear.h>
#include <fstab/fstab.h>
#include <libdm/dm.h>

#include <functional>
#include <string>

#include "tests/support/sleep_script.h"

// Takes the place of those of the platform's volume functions, and of its device mapper's, that
// reach outside the process: answers as it is told and writes each call to standard output, a line
// each, so that it stands among the messages: "read fstab", "mount /dev/block/x at /data", "ensure
// mounted /data/x at /mnt", "ensure unmounted /data", "super partition of slot -1", "create x_a
// from /dev/block/y, table 0, writable, 1000 ms", "destroy x_a", "dm state userdata", "dm path
// userdata", "dm delete userdata". Look-ups in a table stay the platform's. One script for the
// whole process; for tests on one thread.
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
  std::string logical_node;
  std::string slot_suffix;

  // Of device-mapper devices by their name: the state, the node ("": none), and the `errno` that
  // the removal fails with, or 0 for success.
  std::function<android::dm::DmDeviceState(const std::string&)> dm_state = [](const auto&) {
    return android::dm::DmDeviceState::INVALID;
  };
  std::function<std::string(const std::string&)> dm_node = [](const auto&) { return ""; };
  std::function<int(const std::string&)> dm_delete_error = [](const auto&) { return 0; };

  static FakeFsMgr& instance();
  void reset() { *this = FakeFsMgr(); }
};

namespace sentrova::testing {

// Returns a row with these three fields, the rest as the platform has it.
android::fs_mgr::FstabEntry fstab_row(const std::string& block_device,
                                      const std::string& mount_point,
                                      const std::string& file_system = "ext4");

// While one is alive, nothing in the process mounts with mount(2), unmounts with umount(2), sends a
// signal with kill(2) or sleeps: the script answers, and each call is written as above, as
// "mount(2) DEVICE on DIRECTORY as TYPE, FLAGS, DATA", "umount(2) DIRECTORY", "kill PID SIGNAL" or
// "sleep MICROSECONDS". Otherwise the kernel does it. One at a time; for tests on one thread.
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
  SleepScript sleeps_;
};

}  // namespace sentrova::testing
