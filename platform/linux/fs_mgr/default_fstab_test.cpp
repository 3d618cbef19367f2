#include <android-base/file.h>
#include <android-base/properties.h>
#include <fs_mgr/roots.h>
#include <fstab/fstab.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "tests/support/private_mounts.h"

namespace {

using android::base::SetProperty;
using android::base::WriteStringToFile;
using android::fs_mgr::Fstab;
using android::fs_mgr::GetSystemRoot;
using android::fs_mgr::ReadDefaultFstab;

TEST(DefaultFstab, IsTheRescueEnvironmentsElseTheOneNamedByTheHardware) {
  SKIP_WITHOUT_PRIVATE_ROOT();
  const TemporaryDir properties;
  setenv("ANDROID_PROPERTY_DIR", properties.path, 1);
  const sentrova::testing::ScopedTmpfs etc("/etc");
  const sentrova::testing::ScopedTmpfs vendor_etc("/vendor/etc");
  Fstab fstab(1);

  ASSERT_TRUE(SetProperty("ro.hardware", "board"));
  EXPECT_FALSE(ReadDefaultFstab(&fstab)) << "no file";

  ASSERT_TRUE(
      WriteStringToFile("/dev/block/v /vendor ext4 ro wait\n"
                        "/dev/block/s /system ext4 ro wait\n",
                        "/vendor/etc/fstab.board"));
  ASSERT_TRUE(ReadDefaultFstab(&fstab));
  EXPECT_EQ(fstab.size(), 2U);
  EXPECT_EQ(GetSystemRoot(), "/system");

  ASSERT_TRUE(WriteStringToFile("/dev/block/s / ext4 ro wait\n", "/etc/recovery.fstab"));
  ASSERT_TRUE(ReadDefaultFstab(&fstab));
  EXPECT_EQ(fstab.size(), 1U);
  EXPECT_EQ(GetSystemRoot(), "/");

  ASSERT_TRUE(WriteStringToFile("damaged\n", "/etc/recovery.fstab"));
  EXPECT_FALSE(ReadDefaultFstab(&fstab)) << "the other file is no spare";
  unsetenv("ANDROID_PROPERTY_DIR");
}

}  // namespace
