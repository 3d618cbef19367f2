#include "recovery_utils/roots_ex_devices.h"

#include <android-base/properties.h>
#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_ex_host_mode.h"
#include "recovery_utils/roots_ex_log.h"
#include "toolkit/zuno_func.h"

using android::fs_mgr::FstabEntry;
using sentrova::roots_ex::kLogTag;
using sentrova::roots_ex::kMtk;
using sentrova::roots_ex::kQcom;
using sentrova::roots_ex::kSamsung;
using sentrova::roots_ex::otg_devices;

namespace {

constexpr char kUfsMarker[] = "/sys/ufs/ufsid";

constexpr mode_t kOtgMode = 0750;
constexpr int kPasses = 300;
constexpr int kPassesPerReport = 5;
constexpr useconds_t kPassMicroseconds = 200'000;
constexpr unsigned int kSettleSeconds = 1;

bool make_otg_directory() {
  if (mkdir("/otg", kOtgMode) == 0 || errno == EEXIST) {
    return true;
  }
  fprintf(stdout, "[%s]E: can't mkdir otg dir (%s)\n", kLogTag, strerror(errno));
  return false;
}

// These chips' own storage takes more disk names. The list grows with every call, which is relied
// upon.
void extend_otg_devices(const std::string& solution) {
  if (solution != kSamsung && solution != kMtk) {
    return;
  }
  fprintf(stdout,
          "[%s]I: checked run in %s platform, insert sdd otg device list into regular otg list\n",
          kLogTag, solution.c_str());
  auto& devices = otg_devices();
  devices.ufs.insert(devices.ufs.begin(), devices.extra.begin(), devices.extra.end());
}

// Looks at each candidate once. Returns the first that is there and still is after the time in
// which a disk that is just being recognised may come and go; "" if there is none.
std::string look_for_disk(const std::vector<std::string>& candidates, bool report_absent) {
  for (const std::string& candidate : candidates) {
    if (ZunoFunc::Path_Exists(candidate)) {
      sleep(kSettleSeconds);
      if (ZunoFunc::Path_Exists(candidate)) {
        return candidate;
      }
    } else if (report_absent) {
      fprintf(stdout, "[%s]E: can't find otg device %s, wait 1s\n", kLogTag, candidate.c_str());
    }
  }
  return "";
}

bool wait_for_disk(const std::vector<std::string>& candidates) {
  fprintf(stdout, "[%s]I: wait otg device start...\n", kLogTag);
  for (int pass = 1; pass <= kPasses; ++pass) {
    const std::string disk = look_for_disk(candidates, pass % kPassesPerReport == 0);
    if (!disk.empty()) {
      fprintf(stdout, "[%s]I: find otg device %s\n", kLogTag, disk.c_str());
      return true;
    }
    usleep(kPassMicroseconds);
  }
  fprintf(stdout, "[%s]I: wait otg device end...\n", kLogTag);
  return false;
}

// The row may be that of an ancestor directory, as zuno_volume_for_path has it; its device is then
// tried all the same.
std::string sdcard_row_device() {
  const FstabEntry* row = zuno_volume_for_path("/sdcard");
  return row != nullptr ? row->blk_device : "";
}

std::string first_sdcard_device() {
  namespace roots_ex = sentrova::roots_ex;
  const std::string row_device = sdcard_row_device();
  if (roots_ex::has_ufs_storage() && ZunoFunc::Path_Exists(roots_ex::kSdcardPartitionUfs)) {
    return roots_ex::kSdcardPartitionUfs;
  }
  for (const std::string& device :
       {std::string(roots_ex::kSdcardPartition), std::string(roots_ex::kSdcardDisk), row_device}) {
    if (ZunoFunc::Path_Exists(device)) {
      return device;
    }
  }
  return "";
}

}  // namespace

namespace sentrova::roots_ex {

bool has_ufs_storage() {
  return ZunoFunc::Path_Exists(kUfsMarker);
}

OtgDevices& otg_devices() {
  static OtgDevices devices;
  return devices;
}

}  // namespace sentrova::roots_ex

std::string zuno_search_sdcard_device() {
  std::string device = first_sdcard_device();
  fprintf(stdout, "[%s]I: find sdcard devices (%s)\n", kLogTag,
          device.empty() ? "NULL" : device.c_str());
  return device;
}

bool zuno_find_sdcard_device() {
  return !zuno_search_sdcard_device().empty();
}

bool zuno_enable_otg_device() {
  fprintf(stdout, "[%s]I: write the otg host_mode enable\n", kLogTag);
  const std::string solution = android::base::GetProperty("ro.zuno.product.solution", kQcom);
  const std::string platform = android::base::GetProperty("ro.zuno.product.platform", "");
  if (!sentrova::roots_ex::enable_host_mode(solution, platform) || !make_otg_directory()) {
    return false;
  }
  const FstabEntry* row = zuno_volume_for_path("/otg");
  if (row == nullptr) {
    fprintf(stdout, "[%s]E: can't find Volume for /otg\n", kLogTag);
    return false;
  }
  extend_otg_devices(solution);
  std::vector<std::string> candidates = otg_devices().current();
  candidates.insert(candidates.begin(), row->blk_device);
  return wait_for_disk(candidates);
}
