#pragma once

#include <fstab/fstab.h>

#include <string_view>

namespace sentrova::roots_ex {

// Returns whether `mount_point` is the directory `top` or lies below it.
inline bool is_at_or_below(std::string_view mount_point, std::string_view top) {
  return mount_point.starts_with(top) &&
         (mount_point.size() == top.size() || mount_point[top.size()] == '/');
}

inline constexpr char kOtgMountPoint[] = "/otg";

// The vendor's ways to mount a row at its own mount point, one for each kind of volume; see
// zuno_ensure_path_mounted for what they try and return.
int mount_data(const android::fs_mgr::FstabEntry& row);
int mount_sdcard(const android::fs_mgr::FstabEntry& row);
int mount_otg(const android::fs_mgr::FstabEntry& row);

}  // namespace sentrova::roots_ex
