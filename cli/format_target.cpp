#include "cli/format_target.h"

#include <sys/stat.h>

#include "cli/device_state.h"
#include "cli/holders.h"
#include "cli/mounts.h"
#include "cli/printable.h"
#include "datadump/datadump.h"

namespace sentrova {
namespace {

using android::fs_mgr::FstabEntry;

constexpr char kData[] = "/data";

// By the device's name, or where that leads nowhere (/dev/root), by what the files there tell.
bool is_mount_of(const Mount& mount, dev_t device) {
  struct stat root = {};
  return block_device(mount.device) == device ||
         (stat(mount.mount_point.c_str(), &root) == 0 && root.st_dev == device);
}

// The mount point, other than the row's own, at which its device is mounted; empty if there is
// none.
std::string find_other_mount(const FstabEntry& row) {
  const dev_t device = block_device(row.blk_device);
  for (const Mount& mount : read_mounts()) {
    if (mount.mount_point != row.mount_point && is_mount_of(mount, device)) {
      return mount.mount_point;
    }
  }
  return "";
}

// Such a directory would be gone before it could be copied.
bool lies_on_volume(const struct stat& directory, const FstabEntry& row) {
  struct stat mounted = {};
  return directory.st_dev == block_device(row.blk_device) ||
         (find_mount(row.mount_point) && stat(row.mount_point.c_str(), &mounted) == 0 &&
          mounted.st_dev == directory.st_dev);
}

std::string find_directory_obstacle(const std::string& directory, const FstabEntry& row) {
  struct stat status = {};
  if (stat(directory.c_str(), &status) != 0 || !S_ISDIR(status.st_mode)) {
    return directory + " is not a directory";
  }
  return lies_on_volume(status, row) ? directory + " lies on the volume itself" : "";
}

std::string describe_mounted(const FstabEntry& row) {
  const std::optional<Mount> mount = find_mount(row.mount_point);
  if (!mount) {
    return "nothing";
  }
  const FileSystemUse use = read_use(row.mount_point);
  return mount->file_system + " on " + mount->device +
         (use.size > 0 ? ", " + human_size(use.used) + " of " + human_size(use.size) + " used"
                       : "");
}

// The library decides by these which device it takes.
std::string describe_mapping(bool is_dump_armed) {
  const DeviceState state = read_device_state();
  const bool metadata = state.metadata_encryption.value_or(false);
  if (!state.encrypted() || (!metadata && state.crypto_type != "block")) {
    return "";
  }
  return metadata || is_dump_armed
             ? "\n  encryption   its device-mapper device is removed, the partition itself "
               "formatted"
             : "\n  encryption   kept: its device-mapper device is formatted, if there is one";
}

std::string describe_data_format() {
  const int dump = datadump_get_status();
  const bool is_dump_armed = dump == 1 || dump == 2;
  return describe_mapping(is_dump_armed) +
         (is_dump_armed
              ? "\n  data dump    armed: only the first 8 GiB are used, and its offset is "
                "cleared"
              : "");
}

}  // namespace

std::string find_format_obstacle(const FstabEntry& row, const std::string& directory) {
  if (row.mount_point == "/") {
    return "/ is what this device runs from";
  }
  if (row.fs_type != "ext4" && row.fs_type != "f2fs") {
    return row.mount_point + " is " + row.fs_type + "; only ext4 and f2fs are made";
  }
  if (block_device(row.blk_device) == 0) {
    return row.mount_point + " has no device: " + row.blk_device + " is not there";
  }
  if (const std::string other = find_other_mount(row); !other.empty()) {
    return row.blk_device + " is mounted at " + other + " too; unmount that first";
  }
  if (const std::string hold = find_own_hold(row.mount_point);
      !hold.empty() && find_mount(row.mount_point)) {
    return hold;
  }
  return directory.empty() ? "" : find_directory_obstacle(directory, row);
}

std::string describe_format(const FstabEntry& row, const std::string& directory) {
  std::string text = "All that is on " + row.mount_point + " will be lost:\n  device       " +
                     row.blk_device + "\n  file system  " + row.fs_type +
                     ", made anew\n  mounted      " + describe_mounted(row);
  if (row.mount_point == kData) {
    text += describe_data_format();
  }
  if (row.key_loc.starts_with('/')) {
    text += "\n  key device   " + row.key_loc + " may be wiped";
  }
  if (const size_t holders = count_ended_by_force(row.mount_point); holders > 0) {
    text += "\n  in use by    " + std::to_string(holders) +
            " processes, which will be ended where they stay";
  }
  if (!directory.empty()) {
    text += "\n  filled from  " + printable(directory);
  }
  return text;
}

}  // namespace sentrova
