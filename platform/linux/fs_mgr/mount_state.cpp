#include "platform/linux/fs_mgr/mount_state.h"

#include <mntent.h>

#include <cstdio>
#include <memory>
#include <vector>

namespace sentrova::fs_mgr {

namespace {

// The kernel gives a line one page per path; longer option lists are cut, which nobody reads here.
constexpr size_t kLineBytes = 16384;

struct EndMountTable {
  void operator()(FILE* table) const { endmntent(table); }
};

}  // namespace

MountState mount_state(const std::string& mount_point) {
  const std::unique_ptr<FILE, EndMountTable> table(setmntent("/proc/self/mounts", "re"));
  if (table == nullptr) {
    return MountState::kUnknown;
  }
  std::vector<char> line(kLineBytes);
  mntent row = {};
  while (getmntent_r(table.get(), &row, line.data(), static_cast<int>(line.size())) != nullptr) {
    if (mount_point == row.mnt_dir) {
      return MountState::kMounted;
    }
  }
  return ferror(table.get()) != 0 ? MountState::kUnknown : MountState::kNotMounted;
}

}  // namespace sentrova::fs_mgr
