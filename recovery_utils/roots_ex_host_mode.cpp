#include "recovery_utils/roots_ex_host_mode.h"

#include <android-base/file.h>
#include <errno.h>
#include <stdio.h>
#include <string.h>

#include <span>
#include <string_view>

#include "recovery_utils/roots_ex_log.h"
#include "toolkit/zuno_func.h"
#include "toolkitutil/findfile.h"

namespace sentrova::roots_ex {
namespace {

constexpr char kHostModeName[] = "host_mode";
constexpr char kHostModeSearchRoot[] = "/sys/devices/platform";

// The control files of the USB controllers.
constexpr char kQcomDwc3[] = "/sys/bus/platform/drivers/msm-dwc3/a800000.ssusb/host_mode";
constexpr char kQcomSoc[] = "/sys/devices/platform/soc/a600000.ssusb/host_mode";
constexpr char kQcomSocLow[] = "/sys/devices/platform/soc/4e00000.ssusb/host_mode";
constexpr char kQcomVirtual[] = "/sys/devices/virtual/dwc3_vusb/usb0/host_mode";
constexpr char kMtkIddig[] = "/sys/devices/platform/otg_iddig/host_mode";
constexpr char kMtkExtcon[] = "/sys/devices/platform/extcon_usb/host_mode";
constexpr char kSamsungNotifier[] = "/sys/devices/platform/usb_notifier/host_mode";

struct PlatformFile {
  std::string_view platform;
  const char* host_mode_file;
};

constexpr PlatformFile kQcomPlatforms[] = {
    {"SDM660", kQcomDwc3}, {"SDM710", kQcomSoc},     {"SDM845", kQcomSoc}, {"SM6125", kQcomSocLow},
    {"SM6150", kQcomSoc},  {"SM7125", kQcomVirtual}, {"SM7150", kQcomSoc}, {"SM7250", kQcomSoc},
    {"SM8150", kQcomSoc},  {"SM8250", kQcomSoc},
};

constexpr PlatformFile kMtkPlatforms[] = {
    {"MTK6771", kMtkIddig},
    {"MTK6885", kMtkExtcon},
};

struct Solution {
  std::string_view name;
  std::span<const PlatformFile> platforms;
  const char* any_platform;  // the file for platforms that are not listed; null: search first
  const char* fall_back;     // the file when the search finds none
};

constexpr Solution kSolutions[] = {
    {kQcom, kQcomPlatforms, nullptr, kQcomVirtual},
    {kMtk, kMtkPlatforms, nullptr, kMtkExtcon},
    {kSamsung, {}, kSamsungNotifier, kSamsungNotifier},
};
constexpr Solution kUnknownSolution = {"", {}, nullptr, ""};

const Solution& find_solution(const std::string& name) {
  for (const Solution& solution : kSolutions) {
    if (solution.name == name) {
      return solution;
    }
  }
  return kUnknownSolution;
}

// Returns the file that the solution names for the platform, "" if it names none.
std::string listed_host_mode_file(const Solution& solution, const std::string& platform) {
  for (const PlatformFile& row : solution.platforms) {
    if (row.platform == platform) {
      return row.host_mode_file;
    }
  }
  return solution.any_platform != nullptr ? solution.any_platform : "";
}

// Returns the host_mode file to write to, which may not exist; "" if there is none for the
// solution.
std::string find_host_mode_file(const Solution& solution, const std::string& platform) {
  std::string file = listed_host_mode_file(solution, platform);
  if (!ZunoFunc::Path_Exists(file)) {
    file = Find_File::Find(kHostModeName, kHostModeSearchRoot);
  }
  return file.empty() ? solution.fall_back : file;
}

}  // namespace

bool enable_host_mode(const std::string& solution, const std::string& platform) {
  static std::string kept_file;
  if (kept_file.empty()) {
    kept_file = find_host_mode_file(find_solution(solution), platform);
  }
  if (kept_file.empty()) {
    fprintf(stdout, "[%s]E: Failed to find otg enable file\n", kLogTag);
    return false;
  }
  fprintf(stdout, "[%s]I: Find the otg otg enable file: %s\n", kLogTag, kept_file.c_str());
  if (!android::base::WriteStringToFile("enabled", kept_file)) {
    fprintf(stdout, "[%s]E: Failed to write enable to %s (%s)\n", kLogTag, kept_file.c_str(),
            strerror(errno));
    return false;
  }
  return true;
}

}  // namespace sentrova::roots_ex
