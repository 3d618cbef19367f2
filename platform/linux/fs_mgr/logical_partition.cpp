#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <fs_mgr_dm_linear.h>
#include <libdm/dm.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "platform/linux/fs_mgr/super_table.h"

namespace android::fs_mgr {

using android::base::unique_fd;
using sentrova::fs_mgr::decode_super_table;
using sentrova::fs_mgr::kFirstDataSector;
using sentrova::fs_mgr::kSuperSectorBytes;
using sentrova::fs_mgr::kSuperTableBytes;
using sentrova::fs_mgr::kSuperTables;
using sentrova::fs_mgr::LogicalPartition;

namespace {

using Slices = std::vector<LogicalPartition>;

bool refuse(int error, const std::string& text) {
  LOG(ERROR) << text;
  errno = error;
  return false;
}

// Reads a slot's table. False with `errno`: EINVAL where the device ends before it.
bool read_table(const std::string& super, uint32_t slot, std::string& bytes,
                uint64_t& super_sectors) {
  const unique_fd device(open(super.c_str(), O_RDONLY | O_CLOEXEC));
  const off64_t size_bytes = device.ok() ? lseek64(device.get(), 0, SEEK_END) : -1;
  if (size_bytes < 0) {
    return false;
  }
  super_sectors = static_cast<uint64_t>(size_bytes) / kSuperSectorBytes;
  if (super_sectors < kFirstDataSector) {
    errno = EINVAL;
    return false;
  }
  bytes.resize(kSuperTableBytes);
  return base::ReadFullyAtOffset(device.get(), bytes.data(), bytes.size(),
                                 off64_t{slot} * static_cast<off64_t>(kSuperTableBytes));
}

bool read_slices(const std::string& super, uint32_t slot, Slices& slices) {
  const std::string table = "the table of " + super + " for slot " + std::to_string(slot);
  std::string bytes;
  uint64_t super_sectors = 0;
  if (!read_table(super, slot, bytes, super_sectors)) {
    return refuse(errno, "cannot read " + table + ": " + strerror(errno));
  }
  const std::string problem = decode_super_table(bytes, super_sectors, slices);
  return problem.empty() || refuse(EINVAL, table + " is not usable: " + problem);
}

bool find_partition(const CreateLogicalPartitionParams& params, LogicalPartition& partition) {
  if (params.metadata_slot.value_or(kSuperTables) >= kSuperTables) {
    return refuse(EINVAL, "no known slot is given for logical partition " + params.partition_name);
  }
  Slices slices;
  if (!read_slices(params.block_device, *params.metadata_slot, slices)) {
    return false;
  }
  const auto found = std::find_if(slices.begin(), slices.end(), [&](const LogicalPartition& slice) {
    return slice.name == params.partition_name;
  });
  if (found == slices.end()) {
    return refuse(ENOENT,
                  params.block_device + " has no logical partition " + params.partition_name);
  }
  partition = *found;
  return true;
}

}  // namespace

bool CreateLogicalPartition(const CreateLogicalPartitionParams& params, std::string* path) {
  LogicalPartition partition;
  if (!find_partition(params, partition)) {
    return false;
  }
  dm::DmTable table;
  table.Emplace<dm::DmTargetLinear>(0U, partition.sectors, params.block_device,
                                    partition.start_sector);
  table.set_readonly(!params.force_writable);
  return dm::DeviceMapper::Instance().CreateDevice(partition.name, table, path, params.timeout_ms);
}

bool DestroyLogicalPartition(const std::string& name) {
  return dm::DeviceMapper::Instance().DeleteDeviceIfExists(name);
}

}  // namespace android::fs_mgr
