#include "tests/support/fake_fs_mgr.h"

#include <fs_mgr.h>
#include <fs_mgr/roots.h>

FakeFsMgr& FakeFsMgr::instance() {
  static FakeFsMgr platform;
  return platform;
}

namespace sentrova::testing {

android::fs_mgr::FstabEntry fstab_row(const std::string& block_device,
                                      const std::string& mount_point,
                                      const std::string& file_system) {
  android::fs_mgr::FstabEntry row;
  row.blk_device = block_device;
  row.mount_point = mount_point;
  row.fs_type = file_system;
  return row;
}

}  // namespace sentrova::testing

namespace android::fs_mgr {

bool ReadDefaultFstab(Fstab* fstab) {
  FakeFsMgr::instance().calls.push_back("read fstab");
  return FakeFsMgr::instance().read_default_fstab(fstab);
}

bool EnsurePathMounted(Fstab* fstab, const std::string& path, const std::string& mount_point) {
  FakeFsMgr::instance().calls.push_back("ensure mounted " + path + " at " + mount_point);
  return FakeFsMgr::instance().ensure_mounted(fstab, path, mount_point);
}

bool EnsurePathUnmounted(Fstab* fstab, const std::string& path) {
  FakeFsMgr::instance().calls.push_back("ensure unmounted " + path);
  return FakeFsMgr::instance().ensure_unmounted(fstab, path);
}

bool CreateLogicalPartition(const CreateLogicalPartitionParams& params, std::string* path) {
  FakeFsMgr::instance().calls.push_back("create " + params.partition_name + " from " +
                                        params.block_device + ", table " +
                                        std::to_string(params.metadata_slot.value_or(UINT32_MAX)) +
                                        (params.force_writable ? ", writable, " : ", read-only, ") +
                                        std::to_string(params.timeout_ms.count()) + " ms");
  const std::string node = FakeFsMgr::instance().create_logical(params);
  if (node.empty()) {
    return false;
  }
  *path = node;
  return true;
}

bool DestroyLogicalPartition(const std::string& name) {
  FakeFsMgr::instance().calls.push_back("destroy " + name);
  return true;
}

std::string GetSystemRoot() {
  return FakeFsMgr::instance().system_root;
}

}  // namespace android::fs_mgr

int fs_mgr_do_mount_one(const android::fs_mgr::FstabEntry& entry, const std::string& mount_point) {
  FakeFsMgr::instance().calls.push_back("mount " + entry.blk_device + " at " + mount_point);
  return FakeFsMgr::instance().mount_one(entry);
}

std::string fs_mgr_get_slot_suffix() {
  return FakeFsMgr::instance().slot_suffix;
}

std::string fs_mgr_get_super_partition_name(int slot) {
  FakeFsMgr::instance().calls.push_back("super partition of slot " + std::to_string(slot));
  return FakeFsMgr::instance().super_partition_name;
}
