#include "recovery_utils/roots_ex_dm.h"

#include <android-base/properties.h>
#include <errno.h>
#include <libdm/dm.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_ex_log.h"

using android::base::GetBoolProperty;
using android::base::GetProperty;
using sentrova::roots_ex::kLogTag;

namespace {

constexpr int kRemoveTries = 5;
constexpr useconds_t kRetryDelayMicroseconds = 100'000;

}  // namespace

bool sentrova::roots_ex::data_is_mapped() {
  return GetProperty("ro.crypto.state", "") == "encrypted" &&
         (GetProperty("ro.crypto.type", "") == "block" ||
          GetBoolProperty("ro.crypto.metadata.enabled", false));
}

bool volume_revert_dm_device(const std::string& name) {
  if (name.empty()) {
    return false;
  }
  int error = EBUSY;
  for (int tries = 0; tries < kRemoveTries && error == EBUSY; ++tries) {
    if (android::dm::DeviceMapper::Instance().DeleteDeviceIfExists(name)) {
      return true;
    }
    error = errno;
    if (error == EBUSY) {
      fprintf(stdout, "[%s]I: DM_DEV Cannot remove dm-crypt device %s: %s, retrying...\n\n",
              kLogTag, name.c_str(), strerror(error));
      usleep(kRetryDelayMicroseconds);  // after the last try too: the time is counted on
    }
  }
  fprintf(stdout, "[%s]E: DM_DEV Cannot remove dm-crypt device %s: %s\n\n", kLogTag, name.c_str(),
          strerror(error));
  return false;
}
