#pragma once

#include <sys/types.h>

#include <cstdint>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <vector>

namespace sentrova {

// One mounted file system, as a line of /proc/self/mounts tells it.
struct Mount {
  std::string device;
  std::string mount_point;
  std::string file_system;
  std::string options;  // separated by commas
};

// The kernel's table of this moment, in its order; empty if it cannot be read.
std::vector<Mount> read_mounts();

// What is seen at the mount point: of several mounts on one another the last.
std::optional<Mount> find_mount(const std::vector<Mount>& mounts, const std::string& mount_point);

// The same, of this moment's table.
std::optional<Mount> find_mount(const std::string& mount_point);

// The block device behind a path to one; 0 where there is none.
dev_t block_device(const std::string& path);

// How full a mounted file system is, in bytes; all 0 where it does not tell.
struct FileSystemUse {
  uint64_t size = 0;
  uint64_t used = 0;
  uint64_t available = 0;  // to ordinary users; together with `used` it may be less than the size
};

FileSystemUse read_use(const std::string& mount_point);

// The bytes in the largest unit of 1024 that leaves a whole number, with a digit after the point
// below 10: "512", "3.1M", "64M".
std::string human_size(uint64_t bytes);

// {"device", "file_system", "options"}, or null where nothing is mounted.
nlohmann::json mount_as_json(const std::optional<Mount>& mount);

}  // namespace sentrova
