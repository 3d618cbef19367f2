#pragma once

#include <fstab/fstab.h>

#include <string>

#include "common/export.h"

// The volume table: the volumes that the rescue environment knows, one row a partition or
// pseudo-volume. There is one table in the process. It is empty until it is loaded, only loading
// and the volume layer's own rules change it, and it lasts until the process ends.
//
// Nothing here takes a lock: load the table once, before other threads use the volume layer, and
// issue operations that change it one at a time. Look-ups may then come from any thread. The rows
// that they return belong to the table and stay valid until it next changes.

// Reads the platform's default fstab into the table, appends the fixed rows for /tmp (a ramdisk)
// and /cache (ext4 on the partition logdata), applies zuno_load_volume_table (roots_ex.h, which
// mounts /data), lists the table on standard output and applies
// zuno_try_update_fstab_for_root_check.
//
// If the fstab cannot be read, one error goes to the base log and the table stays as the platform
// left it. A second call does all of this again on the same table, so that it adds the fixed rows
// to whatever the platform's reader leaves.
SENTROVA_API void load_volume_table();

// Returns a copy of the table, loading it first if it is empty; still empty if that fails.
SENTROVA_API android::fs_mgr::Fstab get_fstab_default();

// Returns the first row whose mount point is exactly `mount_point`, or null.
SENTROVA_API android::fs_mgr::FstabEntry* volume_for_mount_point(const std::string& mount_point);

// Returns the row that serves `path`: the one whose mount point is `path` or, failing that, its
// nearest ancestor directory (which may be "/"). Null if there is none.
SENTROVA_API android::fs_mgr::FstabEntry* zuno_volume_for_path(const std::string& path);

// Returns whether the table had a row for /cache when this was called for the first time; the
// answer is kept, whatever becomes of the table. Aborts the process, after a fatal line in the base
// log, while the table is empty.
SENTROVA_API bool HasCache();
