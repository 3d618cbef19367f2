#include "recovery_utils/roots_ex_mount.h"

#include <stdio.h>

#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_ex_log.h"

using android::fs_mgr::FstabEntry;
using sentrova::roots_ex::is_at_or_below;
using sentrova::roots_ex::kLogTag;

int zuno_ensure_path_mounted(FstabEntry* entry) {
  if (entry == nullptr) {
    fprintf(stdout, "[%s]I: zuno_ensure_path_mounted: Invlaid parameter\n", kLogTag);
    return -1;
  }
  if (is_at_or_below(entry->mount_point, "/data")) {
    return sentrova::roots_ex::mount_data(*entry);
  }
  if (is_at_or_below(entry->mount_point, "/sdcard")) {
    return sentrova::roots_ex::mount_sdcard(*entry);
  }
  if (is_at_or_below(entry->mount_point, sentrova::roots_ex::kOtgMountPoint)) {
    return sentrova::roots_ex::mount_otg(*entry);
  }
  return -1;
}

std::string blkdevice_for_mount_point(const std::string& mount_point) {
  const FstabEntry* row = volume_for_mount_point(mount_point);
  return row != nullptr ? row->blk_device : "";
}
