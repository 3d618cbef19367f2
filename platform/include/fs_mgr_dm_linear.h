#pragma once

#include <stdint.h>

#include <chrono>
#include <optional>
#include <string>

#include "common/export.h"

// Logical partitions: slices of the super partition, each mapped as a device-mapper device that has
// the partition's name. The table of super names them.
namespace android::fs_mgr {

struct CreateLogicalPartitionParams {
  // The super partition's block device.
  std::string block_device;
  // Whose slot's table to read: 0 or 1. It must be given.
  std::optional<uint32_t> metadata_slot;
  // The name in the table, slot suffix included.
  std::string partition_name;
  // The device is read-only unless this is set.
  bool force_writable = false;
  // How long to wait for the device's node.
  std::chrono::milliseconds timeout_ms = {};
};

// Maps one logical partition. Returns true with *path set to its node, /dev/block/dm-N, which is
// there. Returns false with a line in the base log, `errno`, *path as it was and no device left
// behind: EINVAL for a missing or unknown slot or a damaged table, ENOENT for a partition that the
// table does not name, EBUSY for one that is mapped already, ETIMEDOUT where the node did not
// appear, or what opening or reading the super partition gave. All threads; blocks meanwhile.
SENTROVA_API bool CreateLogicalPartition(const CreateLogicalPartitionParams& params,
                                         std::string* path);

// Removes the mapping of a logical partition; its data stays. Returns true also where it is not
// mapped; false with `errno` EBUSY, and a line in the base log, while it is open or mounted. All
// threads.
SENTROVA_API bool DestroyLogicalPartition(const std::string& name);

}  // namespace android::fs_mgr
