#include <android-base/errno_restorer.h>
#include <android-base/logging.h>
#include <fs_mgr.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <thread>

#include "platform/linux/fs_mgr/file_system_check.h"
#include "platform/linux/fs_mgr/mount_state.h"

namespace {

using android::fs_mgr::FstabEntry;

// The slowest storage that is soldered in has its partitions well before 20 seconds are over.
constexpr std::chrono::milliseconds kDeviceWaitStep(20);
constexpr int kDeviceWaitSteps = 1000;

constexpr mode_t kMountPointMode = 0755;

bool wait_for_device(const std::string& device) {
  for (int step = 0; access(device.c_str(), F_OK) != 0; ++step) {
    if (step == kDeviceWaitSteps) {
      errno = ENOENT;
      return false;
    }
    std::this_thread::sleep_for(kDeviceWaitStep);
  }
  return true;
}

// A repair under a mounted file system would damage it.
bool may_repair(const FstabEntry& entry, const std::string& target) {
  return entry.fs_mgr_flags.check &&
         sentrova::fs_mgr::mount_state(target) == sentrova::fs_mgr::MountState::kNotMounted;
}

// A directory that is there stays as it is. Keeps `errno`: callers show it after a success too.
void make_mount_point(const std::string& target) {
  const android::base::ErrnoRestorer keep_errno;
  mkdir(target.c_str(), kMountPointMode);
}

int failed(const FstabEntry& entry, const std::string& target) {
  PLOG(WARNING) << "cannot mount " << entry.blk_device << " at " << target << " as "
                << entry.fs_type;
  return errno == EBUSY ? FS_MGR_DOMNT_BUSY : FS_MGR_DOMNT_FAILED;
}

}  // namespace

int fs_mgr_do_mount_one(const FstabEntry& entry, const std::string& mount_point) {
  const std::string& target = mount_point.empty() ? entry.mount_point : mount_point;
  if (entry.fs_mgr_flags.wait && !wait_for_device(entry.blk_device)) {
    return failed(entry, target);
  }
  if (may_repair(entry, target)) {
    sentrova::fs_mgr::repair_file_system(entry.blk_device, entry.fs_type);
  }
  make_mount_point(target);
  if (mount(entry.blk_device.c_str(), target.c_str(), entry.fs_type.c_str(), entry.flags,
            entry.fs_options.c_str()) != 0) {
    return failed(entry, target);
  }
  return FS_MGR_DOMNT_SUCCESS;
}
