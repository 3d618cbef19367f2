#pragma once

#include <string>

#include "common/export.h"
#include "fstab/fstab.h"

// The outcomes of fs_mgr_do_mount_one.
#define FS_MGR_DOMNT_FAILED (-1)
#define FS_MGR_DOMNT_BUSY (-2)
#define FS_MGR_DOMNT_SUCCESS 0

// Mounts one row at `mount_point`, or at its own mount point where that is empty, with the row's
// type, flags and options. A missing directory is made (mode 0755). With the option "wait" the
// device node is waited for, at most 20 seconds. With "check" an ext4 or f2fs volume is first
// repaired as far as that is safe, if /system/bin/e2fsck (or /system/bin/fsck.f2fs) is there;
// whatever the tool finds, the mount is tried. Never formats. Returns FS_MGR_DOMNT_SUCCESS;
// FS_MGR_DOMNT_BUSY, with `errno` EBUSY, when the device is mounted there already or held by
// something else; FS_MGR_DOMNT_FAILED with `errno` otherwise, ENOENT where the device did not
// appear. All threads; blocks meanwhile.
SENTROVA_API int fs_mgr_do_mount_one(const android::fs_mgr::FstabEntry& entry,
                                     const std::string& mount_point = "");

// The name of the partition that holds the logical partitions of a slot (0, 1, or -1 for the one
// booted from): "super", or the property "ro.boot.super_partition" where it is set, with the slot's
// suffix on a device with slots. All threads.
SENTROVA_API std::string fs_mgr_get_super_partition_name(int slot = -1);
