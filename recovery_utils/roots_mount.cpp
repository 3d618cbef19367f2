#include <errno.h>
#include <fs_mgr/roots.h>
#include <string.h>
#include <sys/stat.h>

#include <string_view>

#include "common/log_at.h"
#include "recovery_utils/mounts_ex.h"
#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "recovery_utils/volume_table.h"

using android::fs_mgr::EnsurePathUnmounted;
using android::fs_mgr::FstabEntry;
using sentrova::volume_table;

namespace {

constexpr mode_t kMountPointMode = 0755;

void log_error(unsigned int line, std::string_view text) {
  sentrova::log_at({"recovery_utils/roots.cpp", line}, android::base::ERROR, text);
}

// Returns whether the volume is mounted and the platform did not find it busy. That is told by
// `errno`, even one that the call did not touch, which is relied upon.
bool mount_by_platform(FstabEntry& row, const std::string& path, const std::string& target) {
  // The platform formats a volume marked so when it cannot mount it; here that would cost the data.
  const bool formattable = row.fs_mgr_flags.formattable;
  row.fs_mgr_flags.formattable = false;
  const bool mounted = android::fs_mgr::EnsurePathMounted(&volume_table(), path, target);
  row.fs_mgr_flags.formattable = formattable;
  return mounted && errno != EBUSY;
}

// The prefixes are plain: a target such as /sdcard1 is an SD card too.
int mount_volume(FstabEntry& row, const std::string& path, const std::string& target) {
  if (target.starts_with("/otg")) {
    zuno_enable_otg_device();
  }
  if (!target.starts_with("/sdcard")) {
    if (mount_by_platform(row, path, target)) {
      return 0;
    }
    log_error(165, "fail to mount path " + path + "(" + row.blk_device + ") at " + target + " : " +
                       strerror(errno));
    log_error(166, "try to mount by zuno_ensure_path_mounted.");
  }
  return zuno_ensure_path_mounted(&row);
}

// An installation needs the data partition besides the environment's own two.
bool is_needed(const std::string& mount_point) {
  return mount_point == "/tmp" || mount_point == "/cache" || mount_point == "/data";
}

bool is_left_alone(const std::string& mount_point) {
  return mount_point == "/" || mount_point == "/sdcard" || mount_point == "/otg";
}

bool set_up_install_mount(const std::string& mount_point) {
  if (is_needed(mount_point)) {
    if (ensure_path_mounted(mount_point) != 0) {
      log_error(513, "Failed to mount " + mount_point);
      return false;
    }
  } else if (!is_left_alone(mount_point) && !EnsurePathUnmounted(&volume_table(), mount_point)) {
    log_error(518, "Failed to unmount " + mount_point);
    return false;
  }
  return true;
}

}  // namespace

int ensure_path_mounted_at(const std::string& path, const std::string& mount_point) {
  if (path.empty()) {
    log_error(122, "ensure_path_mounted_at get invalid parameters");
    return -1;
  }
  FstabEntry* row = zuno_volume_for_path(path);
  if (row == nullptr) {
    log_error(129, "Failed to get entry for path " + path);
    return -1;
  }
  if (!scan_mounted_volumes()) {
    log_error(134, "Failed to scan mounted volumes");
    return -1;
  }
  const std::string& target = mount_point.empty() ? row->mount_point : mount_point;
  if (find_mounted_volume_by_mount_point(target.c_str()) != nullptr) {
    sentrova::log_at({"recovery_utils/roots.cpp", 143}, android::base::INFO,
                     "Volume (" + target + ") is already mounted");
    return 0;
  }
  mkdir(target.c_str(), kMountPointMode);
  return mount_volume(*row, path, target);
}

int ensure_path_mounted(const std::string& path) {
  return ensure_path_mounted_at(path, "");
}

int ensure_path_unmounted(const std::string& path) {
  return EnsurePathUnmounted(&volume_table(), path) ? 0 : -1;
}

int setup_install_mounts() {
  if (volume_table().empty()) {
    log_error(500, "can't set up install mounts: no fstab loaded");
    return -1;
  }
  for (const FstabEntry& row : volume_table()) {
    if (!set_up_install_mount(row.mount_point)) {
      return -1;
    }
  }
  return 0;
}
