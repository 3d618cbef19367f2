#include "recovery_utils/roots_format_device.h"

#include <android-base/unique_fd.h>
#include <ext4_utils/wipe.h>
#undef error  // a macro of that header
#include <fcntl.h>
#include <sys/stat.h>

#include <string>

#include "recovery_utils/roots_format_log.h"

using android::base::unique_fd;
using android::fs_mgr::FstabEntry;

namespace sentrova {
namespace {

constexpr uint64_t kCryptFooterBytes = 16384;

// The size of a block device or regular file less `reserve_bytes`: 0 for a block device that is
// smaller and for anything else, negative for a regular file that is smaller.
int64_t usable_size(int fd, uint64_t reserve_bytes) {
  struct stat status = {};
  if (fstat(fd, &status) != 0) {
    return 0;
  }
  if (S_ISBLK(status.st_mode)) {
    const uint64_t size = get_block_device_size(fd);
    return size < reserve_bytes ? 0 : static_cast<int64_t>(size - reserve_bytes);
  }
  if (S_ISREG(status.st_mode)) {
    return static_cast<int64_t>(static_cast<uint64_t>(status.st_size) - reserve_bytes);
  }
  return 0;
}

std::optional<int64_t> length_before_tail(const std::string& device, uint64_t reserve_bytes) {
  const unique_fd fd(open(device.c_str(), O_RDONLY | O_CLOEXEC));
  if (fd == -1) {
    format_log::system_error(354, "format_volume: failed to open " + device);
    return std::nullopt;
  }
  const int64_t length = usable_size(fd.get(), reserve_bytes);
  if (length <= 0) {
    format_log::error(359,
                      "get_file_size: invalid size " + std::to_string(length) + " for " + device);
    return std::nullopt;
  }
  return length;
}

}  // namespace

bool wipe_key_device(const FstabEntry& row) {
  if (!row.key_loc.starts_with('/')) {
    return true;
  }
  format_log::info(338, "Wiping " + row.key_loc);
  const unique_fd fd(open(row.key_loc.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644));
  if (fd == -1) {
    format_log::system_error(341, "format_volume: Failed to open " + row.key_loc);
    return false;
  }
  wipe_block_device(fd.get(), usable_size(fd.get(), 0));
  return true;
}

std::optional<int64_t> file_system_length(const FstabEntry& row) {
  if (row.length < 0) {
    return length_before_tail(row.blk_device, -static_cast<uint64_t>(row.length));
  }
  if (row.length == 0 && row.key_loc == "footer") {
    return length_before_tail(row.blk_device, kCryptFooterBytes);
  }
  return row.length;
}

}  // namespace sentrova
