// A block map file, behind its first line: the device is the target's own, so that an input cannot
// have the machine's devices opened. What is mapped is the device's blocks in the map's order, and
// the file in them can all be read.
#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <string>

#include "fuzz/fuzz_target.h"
#include "fuzz/memory_file.h"
#include "otautil/sysutil.h"

namespace {

constexpr size_t kWordsOfDevice = 1 << 15;

// The number of each 64-bit word of the device is its content.
const MemoryFile& device() {
  static const MemoryFile file([] {
    std::string content;
    for (uint64_t i = 0; i < kWordsOfDevice; ++i) {
      content.append(reinterpret_cast<const char*>(&i), sizeof(i));
    }
    return content;
  }());
  return file;
}

void check_mapped(const MemMapping& mapping, const BlockMapData& map) {
  CHECK_EQ(mapping.length, map.file_size);
  size_t position = 0;
  for (const auto& [first, end] : map.block_ranges) {
    const uint64_t first_word = first * map.block_size / sizeof(uint64_t);
    CHECK_EQ(*reinterpret_cast<const uint64_t*>(mapping.addr + position), first_word);
    position += (end - first) * map.block_size;
    // The file's last byte in the range must be there to be read; the last block may go on behind.
    const size_t last = std::min(position, mapping.length) - 1;
    static_cast<void>(*static_cast<const volatile unsigned char*>(mapping.addr + last));
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const MemoryFile map_file(device().path() + "\n" +
                            std::string(reinterpret_cast<const char*>(data), size));
  MemMapping mapping;
  if (mapping.MapFile("@" + map_file.path())) {
    check_mapped(mapping, BlockMapData::ParseBlockMapFile(map_file.path()));
  } else {
    CHECK(mapping.addr == nullptr && mapping.length == 0 && mapping.ranges() == 0);
  }
  return 0;
}
