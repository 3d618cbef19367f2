#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <string>

#include "common/export.h"
#include "recovery_utils/mounts_ex.h"
#include "tests/support/captured_stdout.h"
#include "tests/support/holder.h"
#include "tests/support/loop_device.h"
#include "tests/support/private_mounts.h"

namespace {

using android::base::unique_fd;
using sentrova::testing::CapturedStdout;
using sentrova::testing::Holder;
using ::testing::HasSubstr;

int umount_calls = 0;

// An ext4 volume, mounted at a path with a space, as a card's label gives it.
class BusyVolume : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    std::filesystem::create_directory(mount_point_);
    ASSERT_TRUE(loop_.make_ext4());
    mount_volume();
    ASSERT_TRUE(android::base::WriteStringToFile("content", file_));
    umount_calls = 0;
  }
  void TearDown() override { umount2(mount_point_.c_str(), MNT_DETACH); }

  void mount_volume() const {
    ASSERT_EQ(mount(loop_.path().c_str(), mount_point_.c_str(), "ext4", MS_NOATIME, ""), 0);
  }
  MountedVolume* volume() const {
    return scan_mounted_volumes() ? find_mounted_volume_by_mount_point(mount_point_.c_str())
                                  : nullptr;
  }
  void open_file() const { open(file_.c_str(), O_RDONLY); }

  const sentrova::testing::LoopDevice loop_{16 << 20};
  TemporaryDir folder_;
  const std::string mount_point_ = std::string(folder_.path) + "/the volume";
  const std::string file_ = mount_point_ + "/file";
};

TEST_F(BusyVolume, IsLetGoByHoldersOfEveryKind) {
  const struct {
    const char* name;
    std::function<void()> hold;
    int ending_signal;
    int attempts;
  } cases[] = {
      {"descriptor", [this] { open_file(); }, SIGTERM, 22},
      {"mapping",
       [this] {
         const unique_fd file(open(file_.c_str(), O_RDONLY | O_CLOEXEC));
         static_cast<void>(mmap(nullptr, 1, PROT_READ, MAP_PRIVATE, file.get(), 0));
       },
       SIGTERM, 22},
      {"working directory", [this] { chdir(mount_point_.c_str()); }, SIGTERM, 22},
      {"root directory", [this] { chroot(mount_point_.c_str()); }, SIGTERM, 22},
      {"who ignores the first signal",
       [this] {
         signal(SIGTERM, SIG_IGN);
         open_file();
       },
       SIGKILL, 27},
  };
  for (const auto& c : cases) {
    if (volume() == nullptr) {
      mount_volume();
    }
    const Holder holder(c.hold);
    umount_calls = 0;
    CapturedStdout output;
    EXPECT_EQ(unmount_mounted_volume(volume(), true), 0);
    EXPECT_THAT(output.take(), HasSubstr("-> Sending Terminated to ")) << c.name;
    EXPECT_EQ(holder.ended_by(), c.ending_signal) << c.name;
    EXPECT_EQ(umount_calls, c.attempts) << c.name;
    EXPECT_EQ(volume(), nullptr) << c.name;
  }
}

TEST_F(BusyVolume, StaysWhereNobodyMayBeSignalled) {
  const Holder holder([this] { open_file(); });
  MountedVolume* row = volume();
  ASSERT_NE(row, nullptr);
  EXPECT_EQ(row->device + " " + row->filesystem, loop_.path() + " ext4");
  EXPECT_THAT(row->flags, HasSubstr("noatime"));
  CapturedStdout output;
  EXPECT_EQ(unmount_mounted_volume(row, false), -1);
  EXPECT_EQ(umount_calls, 30);
  EXPECT_EQ(holder.ended_by(), 0);
  const std::string text = output.take();
  EXPECT_THAT(text, HasSubstr(" referencing " + file_ + "\n"));
  EXPECT_THAT(text, HasSubstr("unmounting " + mount_point_ + " failed: Device or resource busy\n"));
  EXPECT_EQ(unmount_mounted_volume(row), -1);
  EXPECT_EQ(errno, EBUSY);
  EXPECT_NE(volume(), nullptr);
}

TEST_F(BusyVolume, AStackedMountIsTakenOffFromTheTop) {
  ASSERT_EQ(mount("upper", mount_point_.c_str(), "tmpfs", 0, ""), 0);
  MountedVolume* row = volume();
  ASSERT_NE(row, nullptr);
  EXPECT_EQ(row->filesystem, "ext4") << "the lower mount's row comes first";
  EXPECT_NE(access(file_.c_str(), F_OK), 0);
  EXPECT_EQ(unmount_mounted_volume(row, false), 0);
  EXPECT_EQ(access(file_.c_str(), F_OK), 0) << "the lower mount is still there";
  EXPECT_EQ(unmount_mounted_volume(volume(), false), 0);
  EXPECT_EQ(volume(), nullptr);
}

}  // namespace

// In place of the system's, for the code under test: counts the attempts.
extern "C" SENTROVA_API int umount(const char* path) noexcept {
  ++umount_calls;
  return static_cast<int>(syscall(SYS_umount2, path, 0));
}
