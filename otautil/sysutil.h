#pragma once

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <string_view>
#include <vector>

#include "common/export.h"
#include "otautil/rangeset.h"

// Whole files as memory, requests to the platform's init process, and help for running programs.
// Errors of the first go to the base log.

// Where the bytes of a file stand on its block device. The default one is empty and tests false.
struct BlockMapData {
  std::string device_path;
  uint64_t file_size = 0;   // bytes
  uint32_t block_size = 0;  // bytes
  RangeSet block_ranges;    // the device's blocks, in the file's order

  explicit operator bool() const { return !device_path.empty(); }

  // The number of blocks that the file fills, the last one perhaps in part; 0 for an empty map.
  uint64_t blocks_needed() const {
    return file_size == 0 || block_size == 0 ? 0 : (file_size - 1) / block_size + 1;
  }

  // Reads a block map, a text file of these lines:
  //
  //     the device's path
  //     file size and block size, in bytes
  //     the number of ranges
  //     one range a line: its first block and the block behind its last
  //
  // Numbers are read as scanf reads them. White space around the whole is passed over, and so is
  // what follows the numbers of a line. The ranges hold exactly the blocks that the file needs, at
  // most 2^32 - 1; the text is at most 64 MiB long. Returns an empty map, with one error logged, on
  // any failure.
  SENTROVA_API static BlockMapData ParseBlockMapFile(const std::string& path);
};

// A file's contents as one stretch of read-only memory, backed by the page cache and not copied.
// Owns its mappings: it can be moved, not copied, and unmaps them when it ends. Each Map call first
// unmaps what was mapped before. An object without a mapping has a null `addr`. One thread at a
// time may map; reading is free to all.
//
// The memory is as good as the file or device behind it: if that shrinks or fails later, a read
// from it raises SIGBUS.
class MemMapping {
 public:
  MemMapping() = default;
  SENTROVA_API ~MemMapping();
  SENTROVA_API MemMapping(MemMapping&& other) noexcept;
  SENTROVA_API MemMapping& operator=(MemMapping&& other) noexcept;
  MemMapping(const MemMapping&) = delete;
  MemMapping& operator=(const MemMapping&) = delete;

  // Maps the named file or, for a name that begins with "@", the file that the block map named by
  // the rest describes. Returns false, with the reasons logged, if it cannot; then nothing is
  // mapped. An empty file cannot be mapped. No descriptor stays open.
  SENTROVA_API bool MapFile(const std::string& filename);

  // Maps the whole file of an open descriptor, which stays the caller's and may be closed. Returns
  // as MapFile does.
  SENTROVA_API bool MapFD(int fd);

  // Maps a file by its block map: one reservation of address space, and in it each range of the
  // device. Block size and ranges must fit the machine's pages, and all of the file's bytes must be
  // on the device. The last block is mapped whole, also where the device ends within it. Returns as
  // MapFile does.
  SENTROVA_API bool MapBlockFile(const std::string& map_path);

  // The number of mappings: one for each block range.
  size_t ranges() const { return mapped_ranges.size(); }

  // One mapping; its length is in bytes.
  struct MappedRange {
    void* addr;
    size_t length;
  };

  // To be read only: the object keeps its account of what it has mapped here.
  unsigned char* addr = nullptr;           // the file's first byte
  size_t length = 0;                       // the file's size in bytes
  std::vector<MappedRange> mapped_ranges;  // what is unmapped in the end

 private:
  bool map_ranges(const BlockMapData& map, int device, unsigned char* reservation,
                  size_t reservation_size);
  void unmap();
};

// Asks init to reboot the device, by the property "sys.powerctl", and sleeps until init has done
// so: it never returns. `reason` says where to boot to ("recovery", "bootloader"; may be empty). On
// a device that was booted quiescently ("ro.boot.quiescent" is true) the next boot is quiescent
// too, except to exactly "bootloader" or "fastboot". If the property cannot be set, one fatal line
// in the base log aborts the process. From any thread.
[[noreturn]] SENTROVA_API void Reboot(std::string_view reason);

// Asks init to power the device off, with a reason that may be empty. Returns at once: true if the
// property was set and the device is about to go down, false if not; nothing is logged. From any
// thread.
SENTROVA_API bool Shutdown(std::string_view reason);

// Returns the array that the exec functions take: a pointer to each argument's characters, in
// order, and a null pointer last. Nothing is copied: the pointers hold while the argument strings
// live unchanged.
SENTROVA_API std::vector<char*> StringVectorToNullTerminatedArray(
    const std::vector<std::string>& arguments);
