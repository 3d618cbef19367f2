// Mounting with the kernel's answers played by the test. What /proc/self/mounts says is real: /proc
// is mounted, /nowhere is not.
#include <android-base/file.h>
#include <fs_mgr.h>
#include <fs_mgr/roots.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <functional>

namespace {

struct PlayedKernel {
  int error = 0;
  std::vector<std::string> calls;
  // Sleeping takes no time here.
  long slept_milliseconds = 0;
  std::function<void()> after_sleep = [] {};
};
PlayedKernel kernel;

int answer(const std::string& call) {
  kernel.calls.push_back(call);
  errno = kernel.error;
  return kernel.error == 0 ? 0 : -1;
}

}  // namespace

extern "C" int mount(const char* device, const char* target, const char* type, unsigned long flags,
                     const void* data) noexcept {
  return answer("mount " + std::string(device) + " " + target + " " + type + " " +
                std::to_string(flags) + " " + static_cast<const char*>(data));
}

// The mount points here are names only.
extern "C" int mkdir(const char* /*path*/, mode_t /*mode*/) noexcept {
  errno = EEXIST;
  return -1;
}

extern "C" int umount(const char* target) noexcept {
  return answer("umount " + std::string(target));
}

extern "C" int nanosleep(const timespec* time, timespec* /*rest*/) {
  kernel.slept_milliseconds += time->tv_sec * 1000 + time->tv_nsec / 1'000'000;
  kernel.after_sleep();
  return 0;
}

namespace {

using android::fs_mgr::EnsurePathMounted;
using android::fs_mgr::EnsurePathUnmounted;
using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using Calls = std::vector<std::string>;

class Mount : public testing::Test {
 protected:
  Mount() {
    kernel = {};
    add("/dev/block/a", "/nowhere", "ext4");
    table_[0].flags = MS_RDONLY;
    table_[0].fs_options = "barrier=1";
    add("/dev/block/p", "/proc", "ext4");
    add("ramdisk", "/tmp", "ramdisk");
  }

  void add(const char* device, const char* mount_point, const char* type) {
    FstabEntry entry;
    entry.blk_device = device;
    entry.mount_point = mount_point;
    entry.fs_type = type;
    table_.push_back(entry);
  }

  Fstab table_;
};

TEST_F(Mount, WaitsTwentySecondsForADeviceThatIsLate) {
  const TemporaryDir folder;
  table_[0].blk_device = folder.path + std::string("/late");
  EXPECT_EQ(fs_mgr_do_mount_one(table_[0]), 0);
  EXPECT_EQ(kernel.slept_milliseconds, 0) << "without the option nothing is waited for";
  table_[0].fs_mgr_flags.wait = true;
  kernel = {};
  EXPECT_EQ(fs_mgr_do_mount_one(table_[0]), FS_MGR_DOMNT_FAILED);
  EXPECT_EQ(errno, ENOENT);
  EXPECT_EQ(kernel.slept_milliseconds, 20'000);
  EXPECT_EQ(kernel.calls, Calls{});
  kernel.slept_milliseconds = 0;
  kernel.after_sleep = [this] {
    if (kernel.slept_milliseconds == 15'000) {
      android::base::WriteStringToFile("", table_[0].blk_device);
    }
  };
  EXPECT_EQ(fs_mgr_do_mount_one(table_[0]), 0);
  EXPECT_EQ(kernel.slept_milliseconds, 15'000);
}

TEST_F(Mount, EnsureMountedLooksAtTheTarget) {
  EXPECT_TRUE(EnsurePathMounted(&table_, "/nowhere/below"));
  EXPECT_TRUE(EnsurePathMounted(&table_, "/proc/1")) << "mounted already";
  EXPECT_TRUE(EnsurePathMounted(&table_, "/nowhere", "/proc")) << "mounted already";
  EXPECT_TRUE(EnsurePathMounted(&table_, "/proc", "/other"));
  EXPECT_TRUE(EnsurePathMounted(&table_, "/tmp/x", "/elsewhere")) << "a ramdisk";
  EXPECT_FALSE(EnsurePathMounted(&table_, "/unknown"));
  EXPECT_EQ(kernel.calls, (Calls{"mount /dev/block/a /nowhere ext4 1 barrier=1",
                                 "mount /dev/block/p /other ext4 0 "}));
  kernel.error = EBUSY;
  EXPECT_TRUE(EnsurePathMounted(&table_, "/nowhere"));
  EXPECT_EQ(fs_mgr_do_mount_one(table_[0]), FS_MGR_DOMNT_BUSY);
  kernel.error = EACCES;
  EXPECT_FALSE(EnsurePathMounted(&table_, "/nowhere"));
  EXPECT_EQ(errno, EACCES);
}

TEST_F(Mount, EnsureUnmountedUnmountsTheRowsMountPoint) {
  EXPECT_TRUE(EnsurePathUnmounted(&table_, "/nowhere/below")) << "not mounted";
  EXPECT_EQ(kernel.calls, Calls{});
  EXPECT_TRUE(EnsurePathUnmounted(&table_, "/proc/1"));
  kernel.error = EBUSY;
  EXPECT_FALSE(EnsurePathUnmounted(&table_, "/proc"));
  EXPECT_EQ(errno, EBUSY);
  EXPECT_EQ(kernel.calls, (Calls{"umount /proc", "umount /proc"}));
  EXPECT_FALSE(EnsurePathUnmounted(&table_, "/tmp")) << "a ramdisk";
  EXPECT_FALSE(EnsurePathUnmounted(&table_, "/unknown"));
}

}  // namespace
