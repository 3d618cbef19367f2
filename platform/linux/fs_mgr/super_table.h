#pragma once

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <string_view>
#include <vector>

namespace sentrova::fs_mgr {

// The table at the head of the super partition, which names its slices.
//
// A table takes 4096 bytes. That of slot 0 stands at the partition's first byte, that of slot 1
// behind it, so that damage to one leaves the other; data begins at sector 16 (byte 8192). Numbers
// are little-endian, sectors are 512 bytes. Unused bytes are zero.
//
//   offset  bytes
//        0      8  magic "SNTRSUPR"
//        8      4  version, 1
//       12      4  number of entries, at most 63
//       16     32  SHA-256 of the 4096 bytes with these 32 as zeros
//       64  64 each  entries, of which each is
//                  0  48  name: 1 to 47 of A-Z a-z 0-9 . _ -, NULs behind it; no two alike
//                 48   8  first sector, at least 16
//                 56   8  number of sectors, at least 1
//
// Slices lie within the partition and do not overlap.
inline constexpr size_t kSuperTableBytes = 4096;
inline constexpr uint32_t kSuperTables = 2;
inline constexpr uint64_t kSuperSectorBytes = 512;
inline constexpr uint64_t kFirstDataSector = kSuperTables * kSuperTableBytes / kSuperSectorBytes;

struct LogicalPartition {
  std::string name;
  uint64_t start_sector = 0;
  uint64_t sectors = 0;
};

// Returns an empty text if these may be the slices of a super partition of `super_sectors`, else
// what is wrong.
std::string check_slices(const std::vector<LogicalPartition>& slices, uint64_t super_sectors);

// Returns the kSuperTableBytes of a table with these slices, which check_slices has passed.
std::string encode_super_table(const std::vector<LogicalPartition>& slices);

// Reads a table of a super partition of `super_sectors`. Returns an empty text with `slices` set,
// or what is wrong with `slices` as it was. The bytes may be anything.
std::string decode_super_table(std::string_view bytes, uint64_t super_sectors,
                               std::vector<LogicalPartition>& slices);

}  // namespace sentrova::fs_mgr
