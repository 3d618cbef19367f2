#include "cli/volume_table.h"

#include <unistd.h>

#include <filesystem>

#include "cli/library_messages.h"
#include "cli/mounts.h"
#include "cli/progress.h"
#include "recovery_utils/roots.h"

namespace sentrova {
namespace {

constexpr char kData[] = "/data";

// What an unlock mounts meanwhile lies on another device and stays.
void unmount_loaded_data() {
  const android::fs_mgr::FstabEntry* row = volume_for_mount_point(kData);
  const std::optional<Mount> data = find_mount(kData);
  if (row != nullptr && data && data->device == row->blk_device) {
    ensure_path_unmounted(kData);
  }
}

}  // namespace

bool load_volumes(const Output& output) {
  note_unless_root(output);
  const bool data_was_mounted = find_mount(kData).has_value();
  bool is_loaded = false;
  {
    const LibraryMessagesToStderr messages;
    const Progress progress("loading the volume table");
    is_loaded = !get_fstab_default().empty();
    if (!data_was_mounted) {
      unmount_loaded_data();
    }
  }
  if (!is_loaded) {
    output.error("the device's volume table cannot be read; the messages tell why");
  }
  return is_loaded;
}

void note_unless_root(const Output& output) {
  if (geteuid() != 0) {
    output.note("not run as root: volumes can be looked at, hardly more");
  }
}

std::string table_path(const std::string& path) {
  if (!path.starts_with('/')) {
    return "";
  }
  std::string clean = std::filesystem::path(path).lexically_normal().string();
  while (clean.size() > 1 && clean.back() == '/') {
    clean.pop_back();
  }
  return clean;
}

}  // namespace sentrova
