#include <android-base/logging.h>
#include <fs_mgr.h>
#include <fs_mgr/roots.h>
#include <libdm/dm.h>
#include <sys/mount.h>

#include <cerrno>

#include "platform/linux/fs_mgr/mount_state.h"

namespace android::fs_mgr {

using sentrova::fs_mgr::mount_state;
using sentrova::fs_mgr::MountState;

namespace {

constexpr char kSystemRoot[] = "/system";
constexpr char kRamdisk[] = "ramdisk";

FstabEntry* find_entry(Fstab* fstab, const std::string& path) {
  FstabEntry* const entry = GetEntryForPath(fstab, path);
  if (entry == nullptr) {
    LOG(ERROR) << "no volume for path " << path;
    errno = ENOENT;
  }
  return entry;
}

MountState logged_mount_state(const std::string& mount_point) {
  const MountState state = mount_state(mount_point);
  if (state == MountState::kUnknown) {
    PLOG(ERROR) << "cannot read the mount table";
  }
  return state;
}

// A partition is mapped under its name; a row that was mapped before keeps its path.
bool use_mapped_device(FstabEntry& entry) {
  if (!entry.fs_mgr_flags.logical) {
    return true;
  }
  return dm::DeviceMapper::Instance().GetDmDevicePathByName(entry.logical_partition_name,
                                                            &entry.blk_device);
}

}  // namespace

bool EnsurePathMounted(Fstab* fstab, const std::string& path, const std::string& mount_point) {
  FstabEntry* const entry = find_entry(fstab, path);
  if (entry == nullptr) {
    return false;
  }
  if (entry->fs_type == kRamdisk) {
    return true;
  }
  const std::string target = mount_point.empty() ? entry->mount_point : mount_point;
  switch (logged_mount_state(target)) {
    case MountState::kMounted:
      return true;
    case MountState::kUnknown:
      return false;
    case MountState::kNotMounted:
      break;
  }
  return use_mapped_device(*entry) && fs_mgr_do_mount_one(*entry, target) != FS_MGR_DOMNT_FAILED;
}

bool EnsurePathUnmounted(Fstab* fstab, const std::string& path) {
  const FstabEntry* const entry = find_entry(fstab, path);
  if (entry == nullptr) {
    return false;
  }
  if (entry->fs_type == kRamdisk) {
    LOG(ERROR) << "a ramdisk stays mounted: " << entry->mount_point;
    errno = EINVAL;
    return false;
  }
  const MountState state = logged_mount_state(entry->mount_point);
  if (state != MountState::kMounted) {
    return state == MountState::kNotMounted;
  }
  if (umount(entry->mount_point.c_str()) != 0) {
    PLOG(WARNING) << "cannot unmount " << entry->mount_point;
    return false;
  }
  return true;
}

std::string GetSystemRoot() {
  Fstab fstab;
  if (ReadDefaultFstab(&fstab) && GetEntryForMountPoint(&fstab, kSystemRoot) != nullptr) {
    return kSystemRoot;
  }
  return "/";
}

}  // namespace android::fs_mgr
