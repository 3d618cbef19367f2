#include <android-base/logging.h>
#include <stdio.h>

#include <iostream>
#include <utility>

#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "recovery_utils/volume_table.h"

using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using sentrova::volume_table;

namespace {

struct FixedRow {
  const char* block_device;
  const char* mount_point;
  const char* file_system;
};

// /cache lies on logdata on these devices. A row for /cache in the fstab stands before this one and
// is found first.
constexpr FixedRow kFixedRows[] = {
    {"ramdisk", "/tmp", "ramdisk"},
    {"/dev/block/by-name/logdata", "/cache", "ext4"},
};

void append_fixed_rows(Fstab& table) {
  for (const FixedRow& row : kFixedRows) {
    FstabEntry entry;
    entry.blk_device = row.block_device;
    entry.mount_point = row.mount_point;
    entry.fs_type = row.file_system;
    table.push_back(std::move(entry));
  }
}

// Numbers go through std::to_string, so that neither a base nor a locale that the process has set
// for std::cout changes them.
void list_rows(const Fstab& table) {
  // The vendor lines before these go through stdio, which need not share std::cout's buffer.
  fflush(stdout);
  std::cout << "recovery filesystem table" << std::endl << "=========================" << std::endl;
  for (size_t i = 0; i < table.size(); ++i) {
    const FstabEntry& row = table[i];
    std::cout << "  " << std::to_string(i) << " " << row.mount_point << " "
              << " " << row.fs_type << " " << row.blk_device << " " << std::to_string(row.length)
              << std::endl;
  }
  std::cout << std::endl;
}

}  // namespace

void load_volume_table() {
  Fstab& table = volume_table();
  if (!android::fs_mgr::ReadDefaultFstab(&table)) {
    LOG(ERROR) << "Failed to read default fstab";
    return;
  }
  append_fixed_rows(table);
  zuno_load_volume_table(table);
  list_rows(table);
  zuno_try_update_fstab_for_root_check(table);
}

Fstab get_fstab_default() {
  if (volume_table().empty()) {
    load_volume_table();
  }
  return volume_table();
}
