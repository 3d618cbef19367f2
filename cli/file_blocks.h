#pragma once

#include <string>

#include "otautil/sysutil.h"

namespace sentrova {

// The block map of a file, or, in words, why it has none; then the map is empty.
struct FileBlocks {
  BlockMapData map;
  std::string error;
};

// Finds the blocks that hold a file on its block device, after its data was written there. The map
// tells where they are now: it is of no use once the file is changed or the file system moves it.
// Refused is a file whose bytes do not stand on one block device as they are read: on a file system
// without a device, encrypted, compressed, with holes or bytes allocated but never written, or kept
// in the file system's own structures.
FileBlocks find_file_blocks(const std::string& path);

// The text of a block map file, with a line end.
std::string block_map_text(const BlockMapData& map);

}  // namespace sentrova
