#include <android-base/properties.h>
#include <errno.h>
#include <fs_mgr.h>
#include <fs_mgr/roots.h>
#include <stdio.h>
#include <string.h>

#include <string_view>
#include <utility>

#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_ex_devices.h"
#include "recovery_utils/roots_ex_log.h"
#include "toolkit/zuno_func.h"

using android::base::GetBoolProperty;
using android::base::GetProperty;
using android::base::SetProperty;
using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using android::fs_mgr::GetEntryForMountPoint;
using android::fs_mgr::GetEntryForPath;
using sentrova::roots_ex::kLogTag;

namespace {

constexpr char kLoader[] = "zuno_load_volume_table";  // names itself in its messages

constexpr char kData[] = "/data";
constexpr char kFbeKeyVersion[] = "/data/unencrypted/key/version";
constexpr char kSystem[] = "/mnt/system";

constexpr char kCryptoType[] = "ro.crypto.type";
constexpr char kCryptoState[] = "ro.crypto.state";
constexpr char kEncrypted[] = "encrypted";

// How mounting the data partition ended.
struct MountOutcome {
  bool mounted;
  int error;  // `errno` right after the call
};

void append_vfat_row(Fstab& table, const char* mount_point, std::string block_device) {
  FstabEntry row;
  row.mount_point = mount_point;
  row.fs_type = "vfat";
  row.blk_device = std::move(block_device);
  table.push_back(std::move(row));
}

void append_removable_media(Fstab& table) {
  namespace roots_ex = sentrova::roots_ex;
  if (GetEntryForMountPoint(&table, "/otg") == nullptr) {
    append_vfat_row(table, "/otg",
                    roots_ex::has_ufs_storage() ? roots_ex::kOtgDeviceUfs : roots_ex::kOtgDevice);
  }
  if (GetEntryForMountPoint(&table, "/sdcard") == nullptr) {
    append_vfat_row(table, "/sdcard", zuno_search_sdcard_device());
  }
}

void publish_declared_encryption(const FstabEntry& data) {
  const auto& flags = data.fs_mgr_flags;
  if (flags.file_encryption) {
    SetProperty(kCryptoType, "file");
    fprintf(stdout, "[%s]I: %s this deives is support file encrypted\n", kLogTag, kLoader);
  } else if (flags.crypt || flags.force_crypt || flags.force_fde_or_fbe) {
    SetProperty(kCryptoType, "block");
    fprintf(stdout, "[%s]I: %s this deives is support block encrypted\n", kLogTag, kLoader);
  }
}

MountOutcome mount_data(const FstabEntry& data) {
  const int result = fs_mgr_do_mount_one(data, kData);
  const int error = errno;
  fprintf(stdout, "[%s]I: %s mount /data result: %d, error: %s\n", kLogTag, kLoader, result,
          strerror(error));
  const bool mounted = result == FS_MGR_DOMNT_SUCCESS || result == FS_MGR_DOMNT_BUSY;
  if (mounted) {
    fprintf(stdout, "[%s]I: %s Success mount %s to %s \n\n", kLogTag, kLoader, kData,
            data.blk_device.c_str());
  }
  return {mounted, error};
}

void classify_by_key_file() {
  if (ZunoFunc::Path_Exists(kFbeKeyVersion)) {
    SetProperty(kCryptoState, kEncrypted);
    fprintf(stdout, "[%s]I: FBE %s %s is exited\n", kLogTag, kLoader, kFbeKeyVersion);
  } else {
    fprintf(stdout, "[%s]I: FBE %s %s isn't exited\n", kLogTag, kLoader, kFbeKeyVersion);
  }
}

// A file-encrypted partition that cannot be mounted has encrypted metadata, or is damaged.
void classify_unmountable(const FstabEntry& data, int mount_error) {
  if (mount_error != EACCES && should_use_metadata_encryption(data)) {
    SetProperty(kCryptoState, kEncrypted);
    fprintf(stdout, "[%s]I: FBE %s is metadata encryption\n", kLogTag, kLoader);
  } else {
    fprintf(stdout, "[%s]E: FBE %s data device maybe damaged\n", kLogTag, kLoader);
  }
}

void publish_encryption_state(const FstabEntry& data, const MountOutcome& mount) {
  // Read back, because the platform may have set it before, for good.
  const std::string type = GetProperty(kCryptoType, "");
  if (type == "file") {
    if (mount.mounted) {
      classify_by_key_file();
    } else {
      classify_unmountable(data, mount.error);
    }
  } else if (type == "block" && !mount.mounted) {
    // Without its key such a partition shows no file system.
    SetProperty(kCryptoState, kEncrypted);
    fprintf(stdout, "[%s]I: FDE %s data is encrypted\n", kLogTag, kLoader);
  }
}

// Returns whether the block device is `partition` or a path that ends in it.
bool names_partition(std::string_view block_device, std::string_view partition) {
  if (!block_device.ends_with(partition)) {
    return false;
  }
  block_device.remove_suffix(partition.size());
  return block_device.empty() || block_device.back() == '/';
}

// Returns the row of the system root; if its device cannot name the partition, that of the
// partition's name taken as a path, where there is another. Null if the root has no row.
const FstabEntry* find_system_source(Fstab& table, const std::string& partition) {
  const FstabEntry* source = GetEntryForPath(&table, android::fs_mgr::GetSystemRoot());
  if (source != nullptr && source->blk_device.size() < partition.size()) {
    const FstabEntry* other = GetEntryForPath(&table, partition);
    return other != nullptr ? other : source;
  }
  return source;
}

void append_system_row(Fstab& table, FstabEntry row) {
  if (row.mount_point != kSystem) {
    row.mount_point = kSystem;
    table.push_back(std::move(row));
  }
}

void update_system_row(Fstab& table, const std::string& partition) {
  FstabEntry* existing = GetEntryForMountPoint(&table, kSystem);
  if (existing != nullptr && names_partition(existing->blk_device, partition)) {
    return;
  }
  const FstabEntry* source = find_system_source(table, partition);
  if (source == nullptr) {
    return;
  }
  if (source->blk_device.size() < partition.size()) {
    // Appended also beside an existing row, which is found first. That is relied upon.
    append_system_row(table, *source);
  } else if (names_partition(source->blk_device, partition)) {
    if (existing != nullptr) {
      *existing = *source;
      existing->mount_point = kSystem;
    } else {
      append_system_row(table, *source);
    }
  }
}

}  // namespace

void zuno_load_volume_table(Fstab& table) {
  if (table.empty()) {
    fprintf(stdout, "[%s]E: %s fstab is empty\n", kLogTag, kLoader);
    return;
  }
  append_removable_media(table);
  const FstabEntry* data = GetEntryForMountPoint(&table, kData);
  if (data == nullptr) {
    fprintf(stdout, "[%s]E: %s Fail to find data entry in fstab\n", kLogTag, kLoader);
    return;
  }
  publish_declared_encryption(*data);
  publish_encryption_state(*data, mount_data(*data));
}

void zuno_try_update_fstab_for_root_check(Fstab& table) {
  if (table.empty()) {
    fprintf(stdout, "[%s]E: fstab for root_check is empty\n", kLogTag);
    return;
  }
  const bool system_is_root = GetBoolProperty("ro.build.system_root_image", false);
  const bool has_dynamic_partitions = GetBoolProperty("ro.boot.dynamic_partitions", false);
  if (system_is_root || has_dynamic_partitions) {
    update_system_row(table, "system" + GetProperty("ro.boot.slot_suffix", ""));
  }
}

bool should_use_metadata_encryption(const FstabEntry& entry) {
  return !entry.metadata_key_dir.empty() &&
         (entry.fs_mgr_flags.file_encryption || entry.fs_mgr_flags.force_fde_or_fbe);
}

std::string get_system_root() {
  return android::fs_mgr::GetSystemRoot();
}
