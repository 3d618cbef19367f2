#pragma once

#include <fstab/fstab.h>

#include <string>

namespace sentrova {

// What a format goes to.
struct FormatTarget {
  std::string device;
  bool wipe_key = true;  // the row's key device goes too
  // A data dump is armed: the file system takes a fixed part of the device.
  bool dump_enabled = false;
};

// Decides which block device a format of the row for /data goes to. On an encrypted device that is
// the mapped device "userdata", in place and with its key kept, or else the row's own once the
// mapping is gone. The mapping has to go when a data dump is armed, with metadata encryption, when
// there is none to be found, and when the caller sets `revert_userdata`; it is set in all of these
// cases. The row's own device is the answer even where the mapping would not go. Takes the mapping
// down where it has to go, and writes to no device.
FormatTarget choose_data_target(const android::fs_mgr::FstabEntry& row, bool& revert_userdata);

}  // namespace sentrova
