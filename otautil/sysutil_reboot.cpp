#include <android-base/logging.h>
#include <android-base/properties.h>
#include <unistd.h>

#include "otautil/sysutil.h"

namespace {

constexpr char kPowerProperty[] = "sys.powerctl";

// The boot loader's own modes know no quiescent boot.
bool takes_quiescent_mark(std::string_view reason) {
  return reason != "fastboot" && reason != "bootloader";
}

}  // namespace

void Reboot(std::string_view reason) {
  std::string command = "reboot," + std::string(reason);
  if (takes_quiescent_mark(reason) && android::base::GetBoolProperty("ro.boot.quiescent", false)) {
    command += ",quiescent";
  }
  if (!android::base::SetProperty(kPowerProperty, command)) {
    LOG(FATAL) << "Reboot failed";
  }
  while (true) {
    pause();
  }
}

bool Shutdown(std::string_view reason) {
  return android::base::SetProperty(kPowerProperty, "shutdown," + std::string(reason));
}
