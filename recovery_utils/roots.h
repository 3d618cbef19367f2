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

// Mounting and unmounting by path. Messages go to the base log, which keeps `errno`; what the
// vendor mount path says goes to standard output. All of it blocks as long as the mounts take.

// Mounts the volume that serves `path` at `mount_point`, or at its row's mount point where that is
// empty, making the directory (mode 0755) if it is missing. Whether something is mounted is asked
// of that directory alone, whatever it is.
//
// A target beginning with "/otg" first has zuno_enable_otg_device wait for the disk. The platform
// mounts the volume, which it is kept from formatting; where it fails or leaves `errno` at EBUSY,
// and at once for a target beginning with "/sdcard" ("/sdcard1" too), zuno_ensure_path_mounted
// (roots_ex.h) does. That mounts the row at its own mount point, also where `mount_point` differs.
//
// Returns 0 if something is mounted there already or the volume is now, -1 if `path` is empty, has
// no row, or the kernel's table of mounts cannot be read, else what the vendor mount path returns.
SENTROVA_API int ensure_path_mounted_at(const std::string& path, const std::string& mount_point);

// As ensure_path_mounted_at with an empty mount point.
SENTROVA_API int ensure_path_mounted(const std::string& path);

// Has the platform unmount the volume that serves `path`, once and without force. Returns 0 if the
// platform has done so or nothing is mounted there, else -1; of mounts stacked upon each other the
// one on top is taken off. See roots_ex.h for the one with force.
SENTROVA_API int ensure_path_unmounted(const std::string& path);

// Mounts /tmp, /cache and /data as far as the table has rows for them and unmounts all other
// volumes but "/", "/sdcard" and "/otg", in the table's order. Returns 0, or -1 at the first row
// that fails, with the rows before it as they were set, or if the table is empty.
SENTROVA_API int setup_install_mounts();

// Makes a fresh file system, ext4 or f2fs, on the volume whose mount point is exactly `volume`:
// everything on it is lost. Unmounts the volume first, killing the processes that hold it if need
// be; wipes its key device if its row names one by path; then runs the platform's tools, at most
// two, and waits for them. The row's negative length, or a key in the footer, keeps the end of the
// device free. If `directory` is not empty, the new file system is filled from it.
//
// /data may lie behind the device-mapper device "userdata" ("ro.crypto.state", "ro.crypto.type",
// "ro.crypto.metadata.enabled"). That is formatted in place with its key kept, or reverted first
// and the partition formatted: always with metadata encryption or an armed data dump (datadump.h),
// where the mapping is not to be found, and when the caller sets `revert_userdata`. The flag is set
// when the function decides for it, and never cleared. While a dump is armed the file system takes
// the first 8 GiB, and the dump's offset is cleared afterwards. /data also follows the properties
// "external_storage.projid.enabled" and "external_storage.casefold.enabled" (f2fs only).
//
// Returns 0 when formatted, although the revert or the clearing of the dump's offset may have
// failed and a tool that was killed by a signal is not noticed but in the log. Returns -1 after an
// error in the base log: before anything has changed if no row, or a ramdisk's, or one with another
// mount point or kind of file system serves the path (of these, the last is unmounted) or it stays
// mounted; later if the key device or the device cannot be opened, the device is no larger than its
// reserved end, or a tool fails. Nothing is undone then.
SENTROVA_API int format_volume(const std::string& volume, const std::string& directory,
                               bool& revert_userdata);

// The same with an empty directory, with a flag that starts out false, or with both.
SENTROVA_API int format_volume(const std::string& volume);
SENTROVA_API int format_volume(const std::string& volume, bool& revert_userdata);
SENTROVA_API int format_volume(const std::string& volume, const std::string& directory);
