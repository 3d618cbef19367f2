#include "device/init/early_mounts.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <fs_mgr.h>
#include <unistd.h>

#include <string>

namespace sentrova::device {
namespace {

constexpr char kHostsFstab[] = "/share/disk/recovery.fstab";
constexpr char kDefaultFstab[] = "/etc/recovery.fstab";

// A copy: a story may change the device's own. Returns false where the host left none.
bool take_fstab() {
  std::string text;
  if (!android::base::ReadFileToString(kHostsFstab, &text)) {
    return false;
  }
  if (!android::base::WriteStringToFile(text, kDefaultFstab)) {
    PLOG(ERROR) << "cannot write " << kDefaultFstab;
  }
  return true;
}

}  // namespace

void mount_early_volumes() {
  android::fs_mgr::Fstab table;
  if (!take_fstab() || !android::fs_mgr::ReadDefaultFstab(&table)) {
    return;
  }
  for (const android::fs_mgr::FstabEntry& row : table) {
    if (row.fs_mgr_flags.first_stage_mount && fs_mgr_do_mount_one(row, row.mount_point) != 0) {
      PLOG(ERROR) << "cannot mount " << row.blk_device << " at " << row.mount_point;
    }
  }
}

}  // namespace sentrova::device
