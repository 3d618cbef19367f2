#include "recovery_utils/volume_table.h"

#include <fs_mgr/roots.h>

#include "common/log_at.h"
#include "recovery_utils/roots.h"

using android::fs_mgr::FstabEntry;

namespace sentrova {
namespace {

android::fs_mgr::Fstab the_table;

constexpr LogPosition kHasCachePosition = {"recovery_utils/roots.cpp", 527};

}  // namespace

android::fs_mgr::Fstab& volume_table() {
  return the_table;
}

}  // namespace sentrova

using sentrova::volume_table;

FstabEntry* volume_for_mount_point(const std::string& mount_point) {
  return android::fs_mgr::GetEntryForMountPoint(&volume_table(), mount_point);
}

FstabEntry* zuno_volume_for_path(const std::string& path) {
  return android::fs_mgr::GetEntryForPath(&volume_table(), path);
}

bool HasCache() {
  if (volume_table().empty()) {
    sentrova::log_at(sentrova::kHasCachePosition, android::base::FATAL,
                     "Check failed: !fstab.empty() ");
  }
  static const bool has_cache = volume_for_mount_point("/cache") != nullptr;
  return has_cache;
}
