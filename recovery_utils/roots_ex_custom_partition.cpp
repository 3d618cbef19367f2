#include <errno.h>
#include <fs_mgr.h>
#include <fs_mgr_dm_linear.h>
#include <libdm/dm.h>
#include <stdio.h>
#include <string.h>
#include <sys/mount.h>

#include <chrono>

#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_ex_log.h"
#include "toolkit/zuno_func.h"

using android::dm::DeviceMapper;
using android::dm::DmDeviceState;
using android::fs_mgr::CreateLogicalPartition;
using android::fs_mgr::CreateLogicalPartitionParams;
using android::fs_mgr::DestroyLogicalPartition;
using android::fs_mgr::FstabEntry;
using sentrova::roots_ex::kLogTag;

namespace {

constexpr double kDeviceTimeoutSeconds = 4.0;
constexpr std::chrono::milliseconds kNodeTimeout(1000);

const FstabEntry* find_row_to_mount(const std::string& name) {
  const FstabEntry* const row = volume_for_mount_point("/" + name);
  return row != nullptr ? row : volume_for_mount_point("/vendor/" + name);
}

// Returns the number of the slot that the device runs from, 0 on a device without slots.
uint32_t current_slot() {
  return fs_mgr_get_slot_suffix() == "_b" ? 1 : 0;
}

// Sets `device` to the node; leaves it if the partition cannot be mapped.
void create_logical_device(const std::string& dm_name, std::string& device) {
  const CreateLogicalPartitionParams params = {
      .block_device = "/dev/block/by-name/" + fs_mgr_get_super_partition_name(),
      .metadata_slot = current_slot(),
      .partition_name = dm_name,
      .force_writable = true,
      .timeout_ms = kNodeTimeout,
  };
  CreateLogicalPartition(params, &device);
}

std::string logical_device(const FstabEntry& row) {
  std::string device = row.blk_device;
  const std::string dm_name = row.blk_device + fs_mgr_get_slot_suffix();
  DeviceMapper& mapper = DeviceMapper::Instance();
  switch (mapper.GetState(dm_name)) {
    case DmDeviceState::ACTIVE:
      mapper.GetDmDevicePathByName(dm_name, &device);
      break;
    case DmDeviceState::INVALID:
      create_logical_device(dm_name, device);
      break;
    case DmDeviceState::SUSPENDED:
      break;
  }
  return device;
}

// Returns the row's device, there or not: the mount tells.
std::string plain_device(const std::string& name, const FstabEntry& row) {
  const bool ready = ZunoFunc::wait_for_block_device(row.blk_device, kDeviceTimeoutSeconds);
  fprintf(stdout, "[%s]I: %s partition block device is ready:%d\n", kLogTag, name.c_str(),
          ready ? 1 : 0);
  return row.blk_device;
}

void mount_row(const std::string& name, const FstabEntry& row, const std::string& device) {
  if (mount(device.c_str(), row.mount_point.c_str(), row.fs_type.c_str(), row.flags,
            row.fs_options.c_str()) == 0 ||
      errno == EBUSY) {
    fprintf(stdout, "[%s]I: Success to mount /%s at %s\n", kLogTag, name.c_str(), device.c_str());
  } else {
    fprintf(stdout, "[%s]E: Fail to mount /%s at %s (%s)\n", kLogTag, name.c_str(), device.c_str(),
            strerror(errno));
  }
}

void remove_logical_device(const std::string& dm_name) {
  switch (DeviceMapper::Instance().GetState(dm_name)) {
    case DmDeviceState::ACTIVE:
      DestroyLogicalPartition(dm_name);
      break;
    case DmDeviceState::SUSPENDED:
      fprintf(stdout, "[%s]E: Unknown device mapper state\n", kLogTag);
      break;
    case DmDeviceState::INVALID:
      break;
  }
}

}  // namespace

void MountCustomPartition(std::string name) {
  const FstabEntry* const row = name.empty() ? nullptr : find_row_to_mount(name);
  if (row == nullptr) {
    return;
  }
  const std::string device =
      row->fs_mgr_flags.logical ? logical_device(*row) : plain_device(name, *row);
  fprintf(stdout, "[%s]I: partition %s block device %s\n", kLogTag, name.c_str(), device.c_str());
  mount_row(name, *row, device);
}

// A partition below /vendor stays mounted, which is relied upon.
void UnMountCustomPartition(std::string name) {
  const FstabEntry* const row = name.empty() ? nullptr : volume_for_mount_point("/" + name);
  if (row == nullptr) {
    return;
  }
  if (ensure_path_unmounted("/" + name) != 0) {
    fprintf(stdout, "[%s]E: Fail to unmount %s\n", kLogTag, name.c_str());
    return;
  }
  // The blank before the line end is part of the text.
  fprintf(stdout, "[%s]I: Success to unmount /%s \n", kLogTag, name.c_str());
  if (row->fs_mgr_flags.logical) {
    remove_logical_device(name + fs_mgr_get_slot_suffix());
  }
}
