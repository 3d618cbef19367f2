#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/mount.h>
#include <unistd.h>

#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_ex_devices.h"
#include "recovery_utils/roots_ex_log.h"
#include "recovery_utils/roots_ex_mount.h"
#include "toolkit/zuno_func.h"

using android::fs_mgr::FstabEntry;

namespace sentrova::roots_ex {
namespace {

constexpr int kSdcardAttempts = 3;
constexpr unsigned int kSdcardSearchSeconds = 1;

constexpr char kOtgMounter[] = "zuno_mount_otg";  // names itself in its messages

constexpr const char* kOtgFileSystems[] = {"vfat", "exfat"};

// The row's options are those of its own type, so none are passed on.
int mount_medium(const char* device, const FstabEntry& row, const char* file_system) {
  return mount(device, row.mount_point.c_str(), file_system, row.flags, "");
}

int try_sdcard(const std::string& device, const FstabEntry& row, int attempt) {
  int result = mount_medium(device.c_str(), row, row.fs_type.c_str());
  if (result == 0) {
    fprintf(stdout, "[%s]I: sdcard mount sucessed\n", kLogTag);
    return result;
  }
  fprintf(stdout,
          "[%s]E: sdcard mount fail(blk_device: %s, fs_type: %s, retry: %d, result:%d): %s\n",
          kLogTag, device.c_str(), row.fs_type.c_str(), attempt, result, strerror(errno));
  result = mount_medium(device.c_str(), row, "exfat");
  if (result == 0) {
    fprintf(stdout, "[%s]I: sdcard mount with exfat file system sucessed\n", kLogTag);
  } else {
    fprintf(stdout, "[%s]E: sdcard mount fail(blk_device: %s, fs_type: exfat): %s\n", kLogTag,
            device.c_str(), strerror(errno));
  }
  return result;
}

// Returns the last mount's result. A busy candidate is done with, but stays a failure.
int try_otg_candidate(const std::string& candidate, const FstabEntry& row) {
  int result = -1;
  for (const char* file_system : kOtgFileSystems) {
    result = mount_medium(candidate.c_str(), row, file_system);
    if (result == 0 || errno == EBUSY) {
      fprintf(stdout, "[%s]I: %s otg mount sucess(blk_device: %s, fs_type: %s)\n", kLogTag,
              kOtgMounter, candidate.c_str(), file_system);
      break;
    }
    fprintf(stdout, "[%s]E: %s otg mount fail(blk_device: %s, fs_type: %s): %s\n", kLogTag,
            kOtgMounter, candidate.c_str(), file_system, strerror(errno));
  }
  return result;
}

}  // namespace

int mount_sdcard(const FstabEntry& row) {
  int result = -1;
  for (int attempt = 0; attempt < kSdcardAttempts && result != 0; ++attempt) {
    const std::string device = zuno_search_sdcard_device();
    if (device.empty()) {
      sleep(kSdcardSearchSeconds);
    } else {
      result = try_sdcard(device, row, attempt);
    }
  }
  return result;
}

int mount_otg(const FstabEntry& row) {
  // Callers choose by the same test; it is repeated because a wrong mount point would be covered.
  if (!is_at_or_below(row.mount_point, kOtgMountPoint)) {
    fprintf(stdout, "[%s]E: %s mount point %s is not match /otg\n", kLogTag, kOtgMounter,
            row.mount_point.c_str());
    return -1;
  }
  int result = -1;
  for (const std::string& candidate : otg_devices().current()) {
    if (!ZunoFunc::Path_Exists(candidate)) {
      fprintf(stdout, "[%s]I: %s block device(%s) is not exist.\n", kLogTag, kOtgMounter,
              candidate.c_str());
      continue;
    }
    result = try_otg_candidate(candidate, row);
    if (result == 0) {
      break;
    }
  }
  return result;
}

}  // namespace sentrova::roots_ex
