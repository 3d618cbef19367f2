#pragma once

#include <string>

#include "common/export.h"
#include "fstab/fstab.h"

namespace android::fs_mgr {

// The row that serves a path: the first one whose mount point is the path itself or, failing that,
// its nearest ancestor directory; or null. The path is taken as it is written. The row belongs to
// the table and stays valid until the table changes.
SENTROVA_API FstabEntry* GetEntryForPath(Fstab* fstab, const std::string& path);

// Mounts the row that serves `path`, at `mount_point` or at its own mount point where that is
// empty, unless something is mounted there. The row of a logical partition gets the path of its
// device-mapper device as blk_device first.
// Returns true when the volume is mounted (a row of type "ramdisk" always is), with `errno` EBUSY
// if the mount found it so. Returns false, with a line in the base log, when no row serves the
// path, the logical partition is not mapped, the mount table cannot be read, or the mount fails
// (`errno` tells why). Unlike its counterpart on Android it formats nothing, "formattable" or not.
// One thread at a time for one table.
SENTROVA_API bool EnsurePathMounted(Fstab* fstab, const std::string& path,
                                    const std::string& mount_point = "");

// Unmounts the mount point of the row that serves `path`. Returns true when nothing is mounted
// there or one unmount succeeded; of several mounts on one point only the topmost goes. Returns
// false, with a line in the base log, when no row serves the path, the row is a "ramdisk", the
// mount table cannot be read, or the unmount fails (`errno` tells why).
SENTROVA_API bool EnsurePathUnmounted(Fstab* fstab, const std::string& path);

// The mount point under which the default fstab lists the system partition: "/system", or "/" where
// it lists none or cannot be read.
SENTROVA_API std::string GetSystemRoot();

}  // namespace android::fs_mgr
