#include <android-base/logging.h>
#include <android-base/strings.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <stdio.h>
#include <unistd.h>

#include <limits>
#include <optional>

#include "common/read_at_most.h"
#include "otautil/sysutil.h"

namespace {

// Device path, sizes and the number of ranges stand before the ranges.
constexpr size_t kHeaderLines = 3;

// Some three million ranges, and so many times those that a process may map (vm.max_map_count).
// What is longer, or never ends, as a device can, must not take the memory.
constexpr size_t kMaxMapBytes = 64 << 20;

// Reads a whole file of any kind. Nothing, with `errno`, otherwise.
std::optional<std::string> read_map(const std::string& path) {
  const android::base::unique_fd file(
      static_cast<int>(TEMP_FAILURE_RETRY(open(path.c_str(), O_RDONLY | O_CLOEXEC))));
  return file.ok() ? sentrova::read_at_most(file.get(), kMaxMapBytes) : std::nullopt;
}

// Returns false, with an error logged, if the line does not hold two positive sizes.
bool parse_sizes(const std::string& line, BlockMapData& map) {
  unsigned long file_size = 0;
  unsigned int block_size = 0;
  if (sscanf(line.c_str(), "%lu%u", &file_size, &block_size) != 2) {
    LOG(ERROR) << "Failed to parse file size and block size: " << line;
    return false;
  }
  if (file_size == 0 || block_size == 0) {
    LOG(ERROR) << "Invalid size in block map file: size " << file_size << ", blksize "
               << block_size;
    return false;
  }
  map.file_size = file_size;
  map.block_size = block_size;
  return true;
}

// Returns false, with an error logged, unless as many range lines follow as the header says.
bool check_range_count(const std::vector<std::string>& lines, const BlockMapData& map) {
  const std::string& line = lines[kHeaderLines - 1];
  size_t range_count = 0;
  if (sscanf(line.c_str(), "%zu", &range_count) != 1) {
    LOG(ERROR) << "Failed to parse block map header: " << line;
    return false;
  }
  if (map.blocks_needed() > std::numeric_limits<uint32_t>::max() || range_count == 0 ||
      range_count != lines.size() - kHeaderLines) {
    LOG(ERROR) << "Invalid data in block map file: size " << map.file_size << ", blksize "
               << map.block_size << ", range_count " << range_count << ", lines " << lines.size();
    return false;
  }
  return true;
}

// Returns false, with an error logged, if the ranges are not exactly the blocks that are needed.
bool parse_ranges(const std::vector<std::string>& lines, BlockMapData& map) {
  uint64_t remaining_blocks = map.blocks_needed();
  for (size_t i = 0; i < lines.size() - kHeaderLines; ++i) {
    const std::string& line = lines[kHeaderLines + i];
    unsigned long start = 0;
    unsigned long end = 0;
    if (sscanf(line.c_str(), "%lu%lu", &start, &end) != 2) {
      LOG(ERROR) << "failed to parse range " << i << ": " << line;
      return false;
    }
    if (end <= start || end - start > remaining_blocks) {
      LOG(ERROR) << "Invalid range: " << start << " " << end;
      return false;
    }
    remaining_blocks -= end - start;
    map.block_ranges.PushBack({start, end});
  }
  if (remaining_blocks != 0) {
    LOG(ERROR) << "Invalid ranges: remaining blocks " << remaining_blocks;
    return false;
  }
  return true;
}

}  // namespace

BlockMapData BlockMapData::ParseBlockMapFile(const std::string& path) {
  const std::optional<std::string> content = read_map(path);
  if (!content) {
    PLOG(ERROR) << "Failed to read " << path;
    return {};
  }
  const std::vector<std::string> lines = android::base::Split(android::base::Trim(*content), "\n");
  if (lines.size() <= kHeaderLines) {
    LOG(ERROR) << "Block map file is too short: " << lines.size();
    return {};
  }
  BlockMapData map;
  map.device_path = lines[0];
  const bool is_valid =
      parse_sizes(lines[1], map) && check_range_count(lines, map) && parse_ranges(lines, map);
  return is_valid ? map : BlockMapData();
}
