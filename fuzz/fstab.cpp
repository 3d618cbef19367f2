// The fstab reader: a table that is refused leaves the caller's as it was, and a row that is taken
// names its device, its mount point and its type.
#include <android-base/logging.h>
#include <fstab/fstab.h>

#include <string>

#include "fuzz/fuzz_target.h"
#include "fuzz/memory_file.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const MemoryFile file(std::string(reinterpret_cast<const char*>(data), size));
  android::fs_mgr::Fstab table(1);
  table[0].mount_point = "before";
  if (!android::fs_mgr::ReadFstabFromFile(file.path(), &table)) {
    CHECK_EQ(table.size(), 1u);
    CHECK_EQ(table[0].mount_point, "before");
    return 0;
  }
  for (const android::fs_mgr::FstabEntry& entry : table) {
    CHECK(!entry.blk_device.empty() && !entry.mount_point.empty() && !entry.fs_type.empty());
    CHECK(android::fs_mgr::GetEntryForMountPoint(&table, entry.mount_point) != nullptr);
  }
  return 0;
}
