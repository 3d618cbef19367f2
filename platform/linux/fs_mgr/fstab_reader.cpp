#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/properties.h>
#include <android-base/strings.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <fstab/fstab.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <optional>

#include "common/read_at_most.h"
#include "platform/linux/fs_mgr/fstab_options.h"
#include "platform/linux/fs_mgr/mount_options.h"
#include "platform/linux/fs_mgr/slots.h"

namespace android::fs_mgr {

namespace {

constexpr char kRecoveryFstab[] = "/etc/recovery.fstab";
constexpr char kVendorFstabPrefix[] = "/vendor/etc/fstab.";
// Far more than any device's table; keeps a damaged one from filling the memory.
constexpr size_t kMaxFstabBytes = 256 * 1024;
constexpr size_t kMaxQuotedLength = 80;

// A FIFO or a device in the file's place would block the reader or never end.
std::optional<std::string> read_regular_file(const std::string& path) {
  const base::unique_fd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  struct stat status = {};
  if (file < 0 || fstat(file.get(), &status) != 0) {
    return std::nullopt;
  }
  if (!S_ISREG(status.st_mode)) {
    errno = EINVAL;
    return std::nullopt;
  }
  return sentrova::read_at_most(file.get(), kMaxFstabBytes);
}

std::vector<std::string> split_fields(const std::string& line) {
  std::vector<std::string> fields;
  for (std::string& field : base::Split(line, " \t")) {
    if (!field.empty()) {
      fields.push_back(std::move(field));
    }
  }
  return fields;
}

// Returns an empty text, or why the entry has no device.
std::string complete_device(FstabEntry& entry) {
  if (entry.fs_mgr_flags.slot_select || entry.fs_mgr_flags.slot_select_other) {
    const std::string suffix = entry.fs_mgr_flags.slot_select
                                   ? fs_mgr_get_slot_suffix()
                                   : sentrova::fs_mgr::other_slot_suffix();
    if (suffix.empty()) {
      return "a slot is asked for on a device without slots";
    }
    entry.blk_device += suffix;
  }
  if (entry.fs_mgr_flags.logical) {
    entry.logical_partition_name = entry.blk_device;
  }
  return "";
}

// Returns an empty text, or what is wrong with the line.
std::string parse_line(const std::string& line, FstabEntry& entry, std::string& unknown) {
  std::vector<std::string> fields = split_fields(line);
  if (fields.size() < 5) {
    return "fewer than five fields";
  }
  entry.blk_device = std::move(fields[0]);
  entry.mount_point = std::move(fields[1]);
  entry.fs_type = std::move(fields[2]);
  sentrova::fs_mgr::apply_mount_options(fields[3], entry);
  const std::string problem = sentrova::fs_mgr::apply_fs_mgr_options(fields[4], entry, unknown);
  return problem.empty() ? complete_device(entry) : problem;
}

std::optional<Fstab> parse_fstab(const std::string& path, const std::string& text) {
  Fstab table;
  size_t line_number = 0;
  for (const std::string& raw_line : base::Split(text, "\n")) {
    ++line_number;
    const std::string line = base::Trim(raw_line);
    if (line.empty() || line[0] == '#') {
      continue;
    }
    FstabEntry entry;
    std::string unknown;
    const std::string problem = parse_line(line, entry, unknown);
    if (!problem.empty()) {
      LOG(ERROR) << path << ":" << line_number << ": " << problem;
      return std::nullopt;
    }
    if (!unknown.empty()) {
      LOG(WARNING) << path << ":" << line_number << ": passed over unknown option "
                   << unknown.substr(0, kMaxQuotedLength);
    }
    table.push_back(std::move(entry));
  }
  return table;
}

}  // namespace

bool ReadFstabFromFile(const std::string& path, Fstab* fstab) {
  const std::optional<std::string> text = read_regular_file(path);
  if (!text) {
    PLOG(ERROR) << "cannot read " << path;
    return false;
  }
  if (text->find('\0') != std::string::npos) {
    LOG(ERROR) << path << ": holds a NUL";
    errno = EINVAL;
    return false;
  }
  std::optional<Fstab> table = parse_fstab(path, *text);
  if (!table) {
    errno = EINVAL;
    return false;
  }
  *fstab = *std::move(table);
  return true;
}

bool ReadDefaultFstab(Fstab* fstab) {
  if (access(kRecoveryFstab, F_OK) == 0) {
    return ReadFstabFromFile(kRecoveryFstab, fstab);
  }
  const std::string hardware = base::GetProperty("ro.hardware", "");
  if (hardware.empty()) {
    LOG(ERROR) << "no " << kRecoveryFstab << ", and ro.hardware names no other fstab";
    errno = ENOENT;
    return false;
  }
  return ReadFstabFromFile(kVendorFstabPrefix + hardware, fstab);
}

}  // namespace android::fs_mgr
