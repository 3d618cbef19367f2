// Calls the volume layer as a rescue program does, for the stories: its messages go to standard
// output, each line as it comes.
//
//   volume_probe volumes           loads the volume table and lists it
//   volume_probe otg               switches the USB port to host mode and waits for a disk
//   volume_probe sdcard SECONDS    looks for an SD card until it is there or the time is over
//   volume_probe mount PATH        mounts the volume that serves the path
//
// Exit status: 0 when the table has rows, the device was found or the volume is mounted, 1 when
// not, 2 for a wrong command line.

#include <android-base/parseint.h>
#include <stdio.h>

#include <chrono>
#include <string_view>
#include <thread>

#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"

namespace {

constexpr int kUsageStatus = 2;
constexpr unsigned int kLongestWaitSeconds = 60;
constexpr std::chrono::milliseconds kLookInterval(200);

bool wait_for_sdcard(std::chrono::seconds limit) {
  const auto end = std::chrono::steady_clock::now() + limit;
  while (!zuno_find_sdcard_device()) {
    if (std::chrono::steady_clock::now() >= end) {
      return false;
    }
    std::this_thread::sleep_for(kLookInterval);
  }
  return true;
}

int usage() {
  fprintf(stderr, "usage: volume_probe volumes | otg | sdcard SECONDS (at most %u) | mount PATH\n",
          kLongestWaitSeconds);
  return kUsageStatus;
}

}  // namespace

int main(int argc, char** argv) {
  const std::string_view verb = argc > 1 ? argv[1] : "";
  unsigned int limit_seconds = 0;
  const bool sdcard = verb == "sdcard" && argc == 3 &&
                      android::base::ParseUint(argv[2], &limit_seconds, kLongestWaitSeconds);
  const bool mount = verb == "mount" && argc == 3;
  if (!sdcard && !mount && !(argc == 2 && (verb == "otg" || verb == "volumes"))) {
    return usage();
  }
  setvbuf(stdout, nullptr, _IOLBF, 0);
  load_volume_table();
  if (sdcard) {
    return wait_for_sdcard(std::chrono::seconds(limit_seconds)) ? 0 : 1;
  }
  if (mount) {
    return ensure_path_mounted(argv[2]) == 0 ? 0 : 1;
  }
  if (verb == "otg") {
    return zuno_enable_otg_device() ? 0 : 1;
  }
  return get_fstab_default().empty() ? 1 : 0;
}
