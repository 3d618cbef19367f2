#include <stdio.h>

#include "recovery_utils/mounts_ex.h"
#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_ex_log.h"

using android::fs_mgr::FstabEntry;
using sentrova::roots_ex::kLogTag;

namespace {

int unmount_by_force(MountedVolume* volume, const std::string& path) {
  const int released = unmount_mounted_volume(volume, true);
  const int unmounted = ensure_path_unmounted(path);
  return released | unmounted;
}

void log_forced(const FstabEntry& row, int result) {
  fprintf(stdout, "[%s]I: force umount volume %s :%s...\n", kLogTag, row.mount_point.c_str(),
          result != 0 ? "Failed" : "Success");
}

bool stays_mounted(const std::string& mount_point) {
  return mount_point == "/" || mount_point == "/tmp" || mount_point == "/cache";
}

}  // namespace

int ensure_path_unmounted(const std::string& path, bool force) {
  const int result = ensure_path_unmounted(path);
  if (result == 0 || !force) {
    return result;
  }
  const FstabEntry* row = zuno_volume_for_path(path);
  if (row == nullptr) {
    fprintf(stdout, "[%s]E: fail to force umount unknown volume for path %s\n", kLogTag,
            path.c_str());
    return -1;
  }
  if (!scan_mounted_volumes()) {
    fprintf(stdout, "[%s]I: scan_mounted_volumes Failed\n", kLogTag);
    log_forced(*row, -1);
    return -1;
  }
  MountedVolume* volume = find_mounted_volume_by_mount_point(row->mount_point.c_str());
  if (volume == nullptr) {
    fprintf(stdout, "[%s]W: can't find mounted volume by mount_point %s\n", kLogTag,
            row->mount_point.c_str());
    return 0;
  }
  const int forced = unmount_by_force(volume, path);
  log_forced(*row, forced);
  return forced;
}

int setup_install_unmounts() {
  const android::fs_mgr::Fstab table = get_fstab_default();
  if (table.empty()) {
    fprintf(stdout, "E:can't set up install unmounts: no fstab loaded");
    return -1;
  }
  for (const FstabEntry& row : table) {
    if (stays_mounted(row.mount_point)) {
      continue;
    }
    if (ensure_path_unmounted(row.mount_point, true) != 0) {
      fprintf(stdout, "I:Failed to unmount %s\n", row.mount_point.c_str());
    } else {
      fprintf(stdout, "I:Unmount %s success.\n", row.mount_point.c_str());
    }
  }
  return 0;
}
