#pragma once

#include <stdint.h>
#include <sys/types.h>

#include <string>
#include <vector>

#include "common/export.h"

// The slot suffix that the device booted from, with its underscore ("_a"), from the property
// "ro.boot.slot_suffix"; where that is unset, "_" and the property "ro.boot.slot". Empty on a
// device without slots. All threads.
SENTROVA_API std::string fs_mgr_get_slot_suffix();

namespace android::fs_mgr {

// One line of an fstab: device, mount point, file system type, mount options and fs_mgr options.
// Sizes are bytes. A field that its line does not give keeps the default below. A plain value.
struct FstabEntry {
  std::string blk_device;
  // With the option "logical": the partition's name, slot suffix included.
  std::string logical_partition_name;
  std::string mount_point;
  std::string fs_type;
  // MS_... of mount(2).
  unsigned long flags = 0;
  // The mount options that are no flag, with commas between them: the data of mount(2).
  std::string fs_options;
  std::string fs_checkpoint_opts;
  // Where the encryption key is: a block device, "footer", or empty.
  std::string key_loc;
  std::string metadata_key_dir;
  std::string metadata_encryption;
  // Positive: the file system's length. Negative: what to leave free at the end of the device.
  off64_t length = 0;
  std::string label;
  int partnum = -1;
  int swap_prio = -1;
  int max_comp_streams = 0;
  off64_t zram_size = 0;
  off64_t reserved_size = 0;
  std::string encryption_options;
  off64_t erase_blk_size = 0;
  off64_t logical_blk_size = 0;
  std::string sysfs_path;
  std::string vbmeta_partition;
  uint64_t zram_backingdev_size = 0;
  std::string avb_keys;

  struct FsMgrFlags {
    bool wait : 1;
    bool check : 1;
    bool crypt : 1;
    bool nonremovable : 1;
    bool vold_managed : 1;
    bool recovery_only : 1;
    bool verify : 1;
    bool force_crypt : 1;
    bool no_emulated_sd : 1;
    bool no_trim : 1;
    bool file_encryption : 1;
    bool formattable : 1;
    bool slot_select : 1;
    bool late_mount : 1;
    bool no_fail : 1;
    bool verify_at_boot : 1;
    bool quota : 1;
    bool avb : 1;
    bool logical : 1;
    bool checkpoint_blk : 1;
    bool checkpoint_fs : 1;
    bool first_stage_mount : 1;
    bool slot_select_other : 1;
    bool fs_verity : 1;
    bool ext_meta_csum : 1;
    bool fs_compress : 1;
    // The volume has either encryption: full-disk where the device was set up with it.
    bool force_fde_or_fbe : 1;
  } fs_mgr_flags = {};

  // Whether full-disk encryption may be used on the volume.
  bool is_encryptable() const {
    return fs_mgr_flags.crypt || fs_mgr_flags.force_crypt || fs_mgr_flags.force_fde_or_fbe;
  }
};

using Fstab = std::vector<FstabEntry>;

// Reads an fstab file: lines of five fields parted by blanks or tabs, namely device, mount point,
// file system type, mount options and fs_mgr options; blank lines and lines beginning with '#' are
// passed over. The device of a line with "slotselect" gets the current slot's suffix
// ("slotselect_other": the other slot's).
// Returns true with *fstab replaced by the lines in order. Returns false with *fstab as it was, and
// an error in the base log that names the file (and the line, counted from 1), when the file cannot
// be read, is larger than 256 KiB or holds a NUL, or a line is malformed: fewer than five fields, a
// value out of its form or range, a slot asked for where there is none. Fs_mgr options that are not
// known are passed over with a warning, and further fields without one. All threads.
SENTROVA_API bool ReadFstabFromFile(const std::string& path, Fstab* fstab);

// As ReadFstabFromFile, of the device's own fstab: /etc/recovery.fstab if that exists, else
// /vendor/etc/fstab.NAME with NAME from the property "ro.hardware".
SENTROVA_API bool ReadDefaultFstab(Fstab* fstab);

// The first row with exactly this mount point, or null. It belongs to the table and stays valid
// until the table changes.
SENTROVA_API FstabEntry* GetEntryForMountPoint(Fstab* fstab, const std::string& path);
SENTROVA_API const FstabEntry* GetEntryForMountPoint(const Fstab* fstab, const std::string& path);

}  // namespace android::fs_mgr
