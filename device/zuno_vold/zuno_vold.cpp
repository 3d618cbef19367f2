// The volume daemon: unlocks the full-disk encryption of the user data. It makes the dm-crypt
// device "userdata" over the partition that the fstab has for /data, with the key in the
// partition's footer. Exit status: 0 when the device is there, 1, after saying why, when it is not.

#include <android-base/logging.h>
#include <fstab/fstab.h>
#include <stdio.h>

#include <string>

#include "device/zuno_vold/crypto_footer.h"
#include "device/zuno_vold/rehearsed_failure.h"
#include "device/zunofscrypt/places.h"

namespace {

bool unlock(std::string& error) {
  const sentrova::Places places;
  android::fs_mgr::Fstab fstab;
  if (!ReadDefaultFstab(&fstab)) {
    error = "cannot read the fstab";
    return false;
  }
  const auto* const row = GetEntryForMountPoint(&fstab, places.data);
  if (row == nullptr || !row->is_encryptable()) {
    error = "the fstab has no row for " + places.data + " with full-disk encryption";
    return false;
  }
  return sentrova::unlock_full_disk(places.mapping, row->blk_device, error);
}

}  // namespace

int main(int, char** argv) {
  android::base::InitLogging(argv, android::base::StderrLogger);
  sentrova::fail_as_rehearsed();
  std::string error;
  if (!unlock(error)) {
    fprintf(stderr, "zuno_vold: %s\n", error.c_str());
    return 1;
  }
  return 0;
}
