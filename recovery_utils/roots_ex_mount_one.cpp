#include <errno.h>
#include <fs_mgr.h>
#include <fs_mgr/roots.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>

#include "recovery_utils/mounts_ex.h"
#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_ex_log.h"

using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using sentrova::roots_ex::kLogTag;

namespace {

constexpr char kMounter[] = "zuno_fs_mgr_do_mount_one";  // names itself in its messages

constexpr mode_t kMountPointMode = 0755;

// Returns the row of the fstab, read anew into `table`, that serves `path`; null, with a message,
// if there is none.
const FstabEntry* read_row(Fstab& table, const std::string& path) {
  if (!android::fs_mgr::ReadDefaultFstab(&table)) {
    fprintf(stdout, "[%s]E: Failed to read default fstab\n", kLogTag);
    return nullptr;
  }
  const FstabEntry* serving = android::fs_mgr::GetEntryForPath(&table, path);
  if (serving == nullptr) {
    fprintf(stdout, "[%s]E: Failed to get entry for path %s\n", kLogTag, path.c_str());
    return nullptr;
  }
  const std::string mount_point = serving->mount_point;
  if (mount_point.empty()) {
    fprintf(stdout, "[%s]E: Failed to get mount_point for path %s\n", kLogTag, path.c_str());
    return nullptr;
  }
  const FstabEntry* row = android::fs_mgr::GetEntryForMountPoint(&table, mount_point);
  if (row == nullptr) {
    fprintf(stdout, "[%s]E: Failed to get entry %s in fstab\n", kLogTag, mount_point.c_str());
  }
  return row;
}

int mount_row(const FstabEntry& row) {
  mkdir(row.mount_point.c_str(), kMountPointMode);
  const int result = fs_mgr_do_mount_one(row, row.mount_point);
  if (result == FS_MGR_DOMNT_SUCCESS || result == FS_MGR_DOMNT_BUSY) {
    fprintf(stdout, "[%s]I: %s Success mount %s to %s\n", kLogTag, kMounter, row.blk_device.c_str(),
            row.mount_point.c_str());
    return 0;
  }
  fprintf(stdout, "[%s]E: %s Fail mount %s to %s (%s)\n", kLogTag, kMounter, row.blk_device.c_str(),
          row.mount_point.c_str(), strerror(errno));
  return -1;
}

}  // namespace

int zuno_fs_mgr_do_mount_one(const std::string& path) {
  static Fstab table;
  if (path.empty()) {
    fprintf(stdout, "[%s]E: ensure_path_mounted_at get invalid parameters\n", kLogTag);
    return -1;
  }
  const FstabEntry* row = read_row(table, path);
  if (row == nullptr) {
    return -1;
  }
  if (!scan_mounted_volumes()) {
    fprintf(stdout, "[%s]E: Failed to scan mounted volumes\n", kLogTag);
    return -1;
  }
  if (find_mounted_volume_by_mount_point(row->mount_point.c_str()) != nullptr) {
    fprintf(stdout, "[%s]I: Volume (%s) is already mounted\n", kLogTag, row->mount_point.c_str());
    return 0;
  }
  return mount_row(*row);
}
