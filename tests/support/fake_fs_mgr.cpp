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

std::string GetSystemRoot() {
  return FakeFsMgr::instance().system_root;
}

}  // namespace android::fs_mgr

int fs_mgr_do_mount_one(const android::fs_mgr::FstabEntry& entry, const std::string& mount_point) {
  FakeFsMgr::instance().calls.push_back("mount " + entry.blk_device + " at " + mount_point);
  return FakeFsMgr::instance().mount_one(entry);
}
