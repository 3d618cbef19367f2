#include "cli/file_blocks.h"

#include <android-base/file.h>
#include <android-base/stringprintf.h>
#include <android-base/strings.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <linux/fiemap.h>
#include <linux/fs.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "cli/mounts.h"

namespace sentrova {
namespace {

using android::base::StringPrintf;
using android::base::unique_fd;

constexpr uint32_t kExtentsPerCall = 512;

// What keeps an extent's bytes from being read off the device; linux/fiemap.h.
constexpr struct {
  uint32_t flag;
  const char* reason;
} kUnreadable[] = {
    {FIEMAP_EXTENT_DATA_INLINE, "is kept within the file system's own structures"},
    {FIEMAP_EXTENT_DATA_TAIL, "shares a block with other files"},
    {FIEMAP_EXTENT_DATA_ENCRYPTED, "is encrypted"},
    {FIEMAP_EXTENT_ENCODED, "is compressed or encrypted"},
    {FIEMAP_EXTENT_DELALLOC, "has not been written to the device"},
    {FIEMAP_EXTENT_UNKNOWN, "has no known place on the device"},
    {FIEMAP_EXTENT_UNWRITTEN, "was allocated but never written"},
    {FIEMAP_EXTENT_NOT_ALIGNED, "does not stand in whole blocks"},
};

std::string system_error(const std::string& what) {
  return what + ": " + strerror(errno);
}

// The node of a block device by what sysfs calls it; empty if there is none.
std::string find_device_node(dev_t device) {
  std::string uevent;
  android::base::ReadFileToString(
      StringPrintf("/sys/dev/block/%u:%u/uevent", major(device), minor(device)), &uevent);
  for (const std::string& line : android::base::Split(uevent, "\n")) {
    if (!android::base::StartsWith(line, "DEVNAME=")) {
      continue;
    }
    const std::string name = line.substr(strlen("DEVNAME="));
    for (const char* const folder : {"/dev/block/", "/dev/"}) {
      if (block_device(folder + name) == device) {
        return folder + name;
      }
    }
  }
  return "";
}

// Returns an empty text, or why the file cannot have a map.
std::string describe_file(int file, BlockMapData& map) {
  struct statx status = {};
  int block_size = 0;
  if (statx(file, "", AT_EMPTY_PATH, STATX_BASIC_STATS, &status) != 0) {
    return system_error("it cannot be examined");
  }
  if (!S_ISREG(status.stx_mode)) {
    return "it is not a regular file";
  }
  if (status.stx_size == 0) {
    return "it is empty";
  }
  if ((status.stx_attributes & STATX_ATTR_ENCRYPTED) != 0) {
    return "it is encrypted";
  }
  map.file_size = status.stx_size;
  map.device_path = find_device_node(makedev(status.stx_dev_major, status.stx_dev_minor));
  if (map.device_path.empty()) {
    return "its file system is not on a block device";
  }
  if (ioctl(file, FIGETBSZ, &block_size) != 0 || block_size <= 0) {
    return system_error("its file system has no block size");
  }
  map.block_size = static_cast<uint32_t>(block_size);
  return "";
}

// Adds the blocks of an extent, up to the file's end. Returns an empty text, or why it cannot.
std::string add_extent(const fiemap_extent& extent, uint64_t& described_bytes, BlockMapData& map) {
  if (extent.fe_logical != described_bytes) {
    return StringPrintf("it has a hole at byte %ju", uintmax_t{described_bytes});
  }
  for (const auto& [flag, reason] : kUnreadable) {
    if ((extent.fe_flags & flag) != 0) {
      return StringPrintf("its data from byte %ju on %s", uintmax_t{described_bytes}, reason);
    }
  }
  if (extent.fe_physical % map.block_size != 0 || extent.fe_length % map.block_size != 0) {
    return "its data does not stand in whole blocks";
  }
  const uint64_t start = extent.fe_physical / map.block_size;
  const uint64_t blocks = std::min<uint64_t>(extent.fe_length / map.block_size,
                                             map.blocks_needed() - map.block_ranges.blocks());
  if (!map.block_ranges.PushBack({start, start + blocks})) {
    return "the file system describes its blocks wrongly";
  }
  described_bytes += extent.fe_length;
  return "";
}

// Asks for the extents from the first byte that is not described yet.
bool read_extents(int file, uint64_t from, std::vector<fiemap>& buffer) {
  buffer.assign(1 + (kExtentsPerCall * sizeof(fiemap_extent)) / sizeof(fiemap) + 1, fiemap{});
  fiemap& request = buffer.front();
  request.fm_start = from;
  request.fm_length = FIEMAP_MAX_OFFSET - from;
  request.fm_flags = FIEMAP_FLAG_SYNC;
  request.fm_extent_count = kExtentsPerCall;
  return ioctl(file, FS_IOC_FIEMAP, &request) == 0;
}

// Returns an empty text, or why the file's blocks cannot be listed.
std::string list_blocks(int file, BlockMapData& map) {
  std::vector<fiemap> buffer;
  uint64_t described_bytes = 0;
  while (described_bytes < map.file_size) {
    if (!read_extents(file, described_bytes, buffer)) {
      return system_error("its file system does not tell its blocks");
    }
    if (buffer.front().fm_mapped_extents == 0) {
      return StringPrintf("it has a hole at byte %ju", uintmax_t{described_bytes});
    }
    for (uint32_t i = 0; i < buffer.front().fm_mapped_extents && described_bytes < map.file_size;
         ++i) {
      const std::string problem = add_extent(buffer.front().fm_extents[i], described_bytes, map);
      if (!problem.empty()) {
        return problem;
      }
    }
  }
  return "";
}

}  // namespace

FileBlocks find_file_blocks(const std::string& path) {
  const unique_fd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (file < 0) {
    return {{}, system_error("cannot open " + path)};
  }
  BlockMapData map;
  std::string problem = describe_file(file.get(), map);
  if (problem.empty()) {
    problem = list_blocks(file.get(), map);
  }
  if (!problem.empty()) {
    return {{}, path + " cannot be mapped: " + problem};
  }
  return {map, ""};
}

std::string block_map_text(const BlockMapData& map) {
  std::string text = map.device_path;
  android::base::StringAppendF(&text, "\n%ju %u\n%zu\n", uintmax_t{map.file_size}, map.block_size,
                               map.block_ranges.size());
  for (const auto& [first, end] : map.block_ranges) {
    android::base::StringAppendF(&text, "%zu %zu\n", first, end);
  }
  return text;
}

}  // namespace sentrova
