#include <fs_mgr/roots.h>
#include <fstab/fstab.h>

#include <algorithm>

namespace android::fs_mgr {

const FstabEntry* GetEntryForMountPoint(const Fstab* fstab, const std::string& path) {
  if (fstab == nullptr) {
    return nullptr;
  }
  const auto found = std::find_if(fstab->begin(), fstab->end(), [&path](const FstabEntry& entry) {
    return entry.mount_point == path;
  });
  return found == fstab->end() ? nullptr : &*found;
}

FstabEntry* GetEntryForMountPoint(Fstab* fstab, const std::string& path) {
  const Fstab* const table = fstab;
  return const_cast<FstabEntry*>(GetEntryForMountPoint(table, path));
}

FstabEntry* GetEntryForPath(Fstab* fstab, const std::string& path) {
  std::string directory = path;
  while (!directory.empty()) {
    if (FstabEntry* const entry = GetEntryForMountPoint(fstab, directory); entry != nullptr) {
      return entry;
    }
    const size_t slash = directory.rfind('/');
    if (slash == std::string::npos || directory == "/") {
      return nullptr;
    }
    directory.resize(slash == 0 ? 1 : slash);
  }
  return nullptr;
}

}  // namespace android::fs_mgr
