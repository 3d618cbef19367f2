#include <android-base/strings.h>
#include <fs_mgr.h>
#include <fs_mgr/roots.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <fstream>

#include "tests/support/loop_device.h"

namespace {

using android::fs_mgr::EnsurePathMounted;
using android::fs_mgr::EnsurePathUnmounted;
using android::fs_mgr::Fstab;
using android::fs_mgr::ReadFstabFromFile;
using sentrova::testing::LoopDevice;
using sentrova::testing::read_device;
using sentrova::testing::run_program;
using sentrova::testing::write_device;
using ::testing::IsSupersetOf;

constexpr int64_t kVolumeBytes = 24 << 20;
// Of an ext4 superblock: the state word, and its values (Documentation/filesystems/ext4).
constexpr int64_t kExt4StateOffset = 1024 + 0x3a;
constexpr int64_t kExt4MagicOffset = 1024 + 0x38;
const std::string kStateClean("\x01\x00", 2);
const std::string kStateWithErrors("\x03\x00", 2);

class FsMgrDevice : public testing::Test {
 protected:
  ~FsMgrDevice() override {
    while (umount2(target().c_str(), MNT_DETACH) == 0) {
    }
  }

  std::string target() const { return folder_.path; }

  // Reads an fstab of the one line: the volume, at the target.
  bool read_row(const std::string& rest) { return read_row(loop_.path(), rest); }
  bool read_row(const std::string& device, const std::string& rest) {
    const TemporaryFile file;
    return android::base::WriteStringToFile(device + " " + target() + " " + rest + "\n",
                                            file.path) &&
           ReadFstabFromFile(file.path, &fstab_);
  }

  // The rows of the mount table for the target: type and options.
  std::vector<std::string> mounts() const {
    std::vector<std::string> found;
    std::ifstream table("/proc/self/mounts");
    for (std::string line; std::getline(table, line);) {
      const std::vector<std::string> fields = android::base::Split(line, " ");
      if (fields.at(1) == target()) {
        found.push_back(fields.at(2) + " " + fields.at(3));
      }
    }
    return found;
  }

  const LoopDevice loop_{kVolumeBytes};
  const TemporaryDir folder_;
  Fstab fstab_;
};

TEST_F(FsMgrDevice, AVolumeIsMountedWithTheRowsFlagsAndOptionsAndUnmounted) {
  ASSERT_TRUE(loop_.make_ext4());
  ASSERT_TRUE(read_row("ext4 ro,noatime,nosuid,nodev,data=journal wait,check"));
  ASSERT_EQ(fs_mgr_do_mount_one(fstab_[0]), FS_MGR_DOMNT_SUCCESS) << strerror(errno);
  ASSERT_EQ(mounts().size(), 1U);
  EXPECT_THAT(android::base::Split(mounts()[0], " ,"),
              IsSupersetOf({"ext4", "ro", "noatime", "nosuid", "nodev", "data=journal"}));
  EXPECT_EQ(fs_mgr_do_mount_one(fstab_[0]), FS_MGR_DOMNT_BUSY);
  EXPECT_TRUE(EnsurePathMounted(&fstab_, target() + "/below"));
  EXPECT_EQ(mounts().size(), 1U);
  {
    const std::ifstream holder(target() + "/lost+found");
    EXPECT_FALSE(EnsurePathUnmounted(&fstab_, target() + "/below"));
    EXPECT_EQ(errno, EBUSY);
  }
  EXPECT_TRUE(EnsurePathUnmounted(&fstab_, target() + "/below"));
  EXPECT_EQ(mounts().size(), 0U);
}

TEST_F(FsMgrDevice, CheckRepairsAVolumeBeforeItIsMounted) {
  ASSERT_TRUE(loop_.make_ext4());
  ASSERT_EQ(read_device(loop_.path(), kExt4StateOffset, 2), kStateClean);
  for (const bool check : {false, true}) {
    ASSERT_TRUE(write_device(loop_.path(), kExt4StateOffset, kStateWithErrors));
    ASSERT_TRUE(read_row(check ? "ext4 defaults check" : "ext4 defaults defaults"));
    ASSERT_EQ(fs_mgr_do_mount_one(fstab_[0]), FS_MGR_DOMNT_SUCCESS);
    ASSERT_EQ(umount(target().c_str()), 0);
    EXPECT_EQ(read_device(loop_.path(), kExt4StateOffset, 2),
              check ? kStateClean : kStateWithErrors);
  }
}

TEST_F(FsMgrDevice, AVolumeThatLooksEncryptedIsNotTouched) {
  ASSERT_TRUE(loop_.make_ext4());
  ASSERT_TRUE(write_device(loop_.path(), kExt4MagicOffset, std::string(2, '\x5a')));
  const std::string before = read_device(loop_.path(), 0, kVolumeBytes);
  ASSERT_TRUE(read_row("ext4 defaults check,formattable"));
  EXPECT_FALSE(EnsurePathMounted(&fstab_, target()));
  EXPECT_EQ(errno, EINVAL);
  EXPECT_TRUE(read_device(loop_.path(), 0, kVolumeBytes) == before);
}

TEST_F(FsMgrDevice, F2fsIsCheckedAndMountedUnlessItLooksEncrypted) {
  const LoopDevice volume(64 << 20);
  ASSERT_EQ(run_program({"/system/bin/make_f2fs", "-q", volume.path()}), 0);
  ASSERT_TRUE(read_row(volume.path(), "f2fs noatime check"));
  ASSERT_TRUE(EnsurePathMounted(&fstab_, target())) << strerror(errno);
  ASSERT_TRUE(EnsurePathUnmounted(&fstab_, target()));

  // Both superblocks, as an encrypted volume has them.
  ASSERT_TRUE(write_device(volume.path(), 0, std::string(8192, '\x5a')));
  const std::string before = read_device(volume.path(), 0, 4 << 20);
  EXPECT_FALSE(EnsurePathMounted(&fstab_, target()));
  EXPECT_TRUE(read_device(volume.path(), 0, 4 << 20) == before);
}

}  // namespace
