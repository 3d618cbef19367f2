#pragma once

#include <fstab/fstab.h>

#include <string>

#include "common/export.h"

// What the vendor adds to the volume table: rows for removable media, the classification of the
// data partition's encryption, the system partition's row, the removable devices themselves,
// mounting and unmounting where the platform's own is not enough, and the partitions that hold the
// vendor's property files.
//
// Messages go to standard output, each line beginning with "[ROOTS]" and a level. Nothing here
// takes a lock; see roots.h for threads. Properties are the platform's.

// Completes a table that was just read:
// - appends a vfat row for /otg (on sdg1 of a device with UFS storage, else on sda1) and one for
//   /sdcard (on what zuno_search_sdcard_device returns, possibly nothing) if it has none;
// - sets "ro.crypto.type" to "file" or "block" by the flags of the row for /data, if they declare
//   either;
// - mounts /data once, where it stays mounted, and sets "ro.crypto.state" to "encrypted" where the
//   outcome shows that it is: file-based with a key version file or, unmountable, with metadata
//   encryption; block-based and unmountable. The type counts as the property shows it, whoever set
//   it.
// Failures are logged and nothing is returned: an empty table is left empty, and one without a row
// for /data gets only the two rows.
SENTROVA_API void zuno_load_volume_table(android::fs_mgr::Fstab& table);

// On a device whose system partition is the root or lies in super ("ro.build.system_root_image" or
// "ro.boot.dynamic_partitions"), makes the table's row for /mnt/system name the system partition of
// the current slot ("ro.boot.slot_suffix"): appends or overwrites one row, as a copy of the row of
// the system root. Leaves the table as it is if it is empty (with a message), names the partition
// already, or has no row to copy.
//
// A partition is named by a block device that is its name or ends with "/" and its name. A system
// root whose block device is shorter than the name cannot be compared with it; its row is then
// appended unless it stands at /mnt/system itself, also beside another row for /mnt/system.
SENTROVA_API void zuno_try_update_fstab_for_root_check(android::fs_mgr::Fstab& table);

// Returns whether the row has a metadata key directory and is encrypted by file
// (`file_encryption` or `force_fde_or_fbe`).
SENTROVA_API bool should_use_metadata_encryption(const android::fs_mgr::FstabEntry& entry);

// Returns the platform's mount point of the system partition, "/" or "/system".
SENTROVA_API std::string get_system_root();

// Returns the block device of the SD card: the first that exists of mmcblk0p1 (only on a device
// with UFS storage), mmcblk1p1, mmcblk1 and the device of the volume table's row for /sdcard. Empty
// if there is none.
SENTROVA_API std::string zuno_search_sdcard_device();

// Returns whether zuno_search_sdcard_device finds a device.
SENTROVA_API bool zuno_find_sdcard_device();

// Switches the USB controller to host mode by writing "enabled" to its host_mode file, makes the
// directory /otg and waits for a disk: the device of the volume table's row for /otg or one of the
// usual ones. The file is chosen by "ro.zuno.product.solution" (QCOM if absent, MTK or SAMSUNG) and
// "ro.zuno.product.platform", else searched under /sys/devices/platform; once found it is kept
// until the process ends. On MTK and SAMSUNG every call that comes to the wait puts two more
// devices in front of the usual ones with UFS storage.
//
// Returns true once a device is there and still is a second later; false if the file, the directory
// or the row for /otg is missing or cannot be made, or no device stays within 300 looks 200
// milliseconds apart (about a minute when nothing appears; each device that vanishes within its
// second adds it). Host mode and directory stay in either case. Blocks; one call at a time.
SENTROVA_API bool zuno_enable_otg_device();

// Mounts the table's row `entry` at its own mount point, which must exist, as the vendor does it.
// Rows are known by a mount point that is "/data", "/sdcard" or "/otg" or lies below it:
// - data: the device-mapper device "userdata" where "ro.crypto.state" is "encrypted" and either
//   "ro.crypto.type" is "block" or "ro.crypto.metadata.enabled" is true, else the row's device. A
//   device-mapper device is waited for, 25 times 200 milliseconds. Two attempts, each with its
//   wait; a device that is busy counts as a failure, though the message calls it a success.
// - SD card: what zuno_search_sdcard_device finds, with the row's type, then as exfat. Three
//   attempts, with a second's sleep after each search that finds nothing.
// - OTG: the disk's first partition, then the whole disk (sdg on a device with UFS storage, after
//   what zuno_enable_otg_device has added; else sda), each as vfat, then as exfat, until one is
//   mounted. One that is busy counts as a failure here too, but its other type is not tried.
// Returns 0, or the result of the last mount(2) that failed; -1 where none was tried, without a
// message for other rows. A null `entry` is logged and returns -1. The row stays the caller's and
// as it is.
SENTROVA_API int zuno_ensure_path_mounted(android::fs_mgr::FstabEntry* entry);

// Reads the default fstab anew, not touching the volume table, and has the platform mount the
// volume that serves `path` at its mount point, making the directory (mode 0755) if it is missing.
// Returns 0 if it is mounted (already, or held busy by another mount), -1 on any failure.
SENTROVA_API int zuno_fs_mgr_do_mount_one(const std::string& path);

// Returns the block device of volume_for_mount_point(`mount_point`), or "" if there is no row.
SENTROVA_API std::string blkdevice_for_mount_point(const std::string& mount_point);

// Removes the device-mapper device `name`. A busy device gets five tries 100 milliseconds apart,
// any other failure ends them. Returns true if there is no such device any more; false if it stays,
// or for an empty name.
SENTROVA_API bool volume_revert_dm_device(const std::string& name);

// As ensure_path_unmounted of roots.h. Where that fails and `force` is set, unmounts the volume
// patiently (unmount_mounted_volume, which kills the processes that hold it) and tries again.
// Returns 0 if the volume is not mounted any more, also where nothing is mounted at its row's mount
// point; non-zero if either step failed, no row serves `path` or the kernel's table of mounts
// cannot be read.
SENTROVA_API int ensure_path_unmounted(const std::string& path, bool force);

// Unmounts, with force, every volume of the table but "/", "/tmp" and "/cache", loading the table
// first if it is empty. Returns 0 whatever came of each volume, which the messages tell (these
// without a tag); -1 if there is no table.
SENTROVA_API int setup_install_unmounts();

// The vendor's properties stand in files on two small partitions, "oem" and "kcf", the persistent
// ones on the data partition. A property loader outside this library reads them: it is asked by a
// request property set to "1" and sets a completion property to "1" when done. One that does not
// answer within 5 seconds is not waited for any longer and holds nothing else up. A completion that
// still is "1" from before ends the wait at once: who asks a second time sets it to "0" first.

// Mounts "oem" and "kcf" (MountCustomPartition), asks for their properties ("recovery.load.props",
// answered by "recovery.properties.loaded"), calls zunoPropertyPrebackup and unmounts both
// (UnMountCustomPartition), unless "recovery.repair_mode" is on. Always returns true; whether the
// properties are there, "recovery.oem_properties.ready" and "recovery.kcf_properties.ready" tell.
// Blocks for some 20 seconds at most, more where the kernel takes long to mount.
SENTROVA_API bool zuno_load_property();

// Replaces the backups /cache/recovery/oem.prop and kcf.prop by copies of /tmp/oem.prop and
// kcf.prop, mode 0644, once the loader has both ("recovery.oem_properties.ready" is "true", and so
// is "recovery.kcf_properties.ready" on a device with "ro.recovery.kcf.support" "1"). Otherwise
// leaves them and asks the loader to load them ("recovery.load.backup_props", answered by
// "recovery.backup_props.loaded"). Whether files could be removed or copied is not told; a working
// copy that is missing leaves an empty backup.
SENTROVA_API void zunoPropertyPrebackup();

// Removes the two backups.
SENTROVA_API void zunoPropertyPostBackup();

// Mounts /data, if it can, and asks for the persistent properties ("recovery.load.persist_props",
// answered by "recovery.persist_properties.loaded"). Returns whether
// "recovery.persistent_properties.ready" is then exactly "true".
SENTROVA_API bool zuno_load_persist_property();

// Mounts a vendor partition, by the row for "/" + `name` or else for "/vendor/" + `name`, on the
// row's mount point, which must exist. A logical partition has the device-mapper name of the row's
// block device and the slot suffix: it is mapped, writable, from the current slot's table of super
// if it is not mapped yet; a suspended one is not touched, and the row's block device is tried. The
// device of any other row is waited for, at most 4 seconds. The outcome is only logged; without a
// name or a row nothing happens.
SENTROVA_API void MountCustomPartition(std::string name);

// Unmounts the partition of the row for "/" + `name` (one below /vendor stays) and removes the
// device-mapper device `name` and the slot suffix if the row is a logical partition's. It stays
// when it is suspended or the unmount fails. The outcome is only logged; without a name or a row
// nothing happens.
SENTROVA_API void UnMountCustomPartition(std::string name);
