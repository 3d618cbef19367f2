#include "cli/mounts.h"

#include <android-base/stringprintf.h>
#include <mntent.h>
#include <stdio.h>
#include <sys/stat.h>
#include <sys/statvfs.h>

#include <algorithm>
#include <memory>
#include <nlohmann/json.hpp>

namespace sentrova {

std::vector<Mount> read_mounts() {
  std::vector<Mount> mounts;
  const std::unique_ptr<FILE, int (*)(FILE*)> table(setmntent("/proc/self/mounts", "re"),
                                                    endmntent);
  while (table != nullptr) {
    const mntent* row = getmntent(table.get());
    if (row == nullptr) {
      break;
    }
    mounts.push_back({.device = row->mnt_fsname,
                      .mount_point = row->mnt_dir,
                      .file_system = row->mnt_type,
                      .options = row->mnt_opts});
  }
  return mounts;
}

std::optional<Mount> find_mount(const std::vector<Mount>& mounts, const std::string& mount_point) {
  const auto found = std::find_if(mounts.rbegin(), mounts.rend(), [&](const Mount& mount) {
    return mount.mount_point == mount_point;
  });
  return found == mounts.rend() ? std::nullopt : std::optional(*found);
}

std::optional<Mount> find_mount(const std::string& mount_point) {
  return find_mount(read_mounts(), mount_point);
}

dev_t block_device(const std::string& path) {
  struct stat status = {};
  return stat(path.c_str(), &status) == 0 && S_ISBLK(status.st_mode) ? status.st_rdev : 0;
}

FileSystemUse read_use(const std::string& mount_point) {
  struct statvfs status = {};
  if (statvfs(mount_point.c_str(), &status) != 0) {
    return {};
  }
  return {.size = status.f_blocks * status.f_frsize,
          .used = (status.f_blocks - status.f_bfree) * status.f_frsize,
          .available = status.f_bavail * status.f_frsize};
}

std::string human_size(uint64_t bytes) {
  constexpr char kUnits[] = "KMGTPE";
  if (bytes < 1024) {
    return std::to_string(bytes);
  }
  size_t unit = 0;
  double size = static_cast<double>(bytes) / 1024;
  for (; size >= 1023.5; size /= 1024) {
    ++unit;
  }
  return android::base::StringPrintf(size < 9.95 ? "%.1f%c" : "%.0f%c", size, kUnits[unit]);
}

nlohmann::json mount_as_json(const std::optional<Mount>& mount) {
  if (!mount) {
    return nullptr;
  }
  return {
      {"device", mount->device}, {"file_system", mount->file_system}, {"options", mount->options}};
}

}  // namespace sentrova
