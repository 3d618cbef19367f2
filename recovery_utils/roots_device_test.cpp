#include <android-base/file.h>
#include <android-base/properties.h>
#include <gmock/gmock.h>
#include <linux/magic.h>
#include <stdlib.h>
#include <sys/mount.h>
#include <sys/statfs.h>

#include <filesystem>
#include <memory>
#include <string>

#include "recovery_utils/roots.h"
#include "tests/support/captured_stdout.h"
#include "tests/support/loop_device.h"
#include "tests/support/private_mounts.h"

namespace {

using android::base::GetProperty;
using android::base::SetProperty;
using android::base::WriteStringToFile;
using sentrova::testing::CapturedStdout;
using sentrova::testing::ScopedTmpfs;
using ::testing::HasSubstr;

constexpr char kSystemRow[] = "/dev/block/by-name/system_a /system ext4 ro wait\n";

// The device's fstab and properties are the test's own, and /data is an empty directory on which
// the test's disk may come to be mounted.
class Roots : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    ASSERT_NE(disk_.path(), "");
    clear_properties();
    std::filesystem::create_directories("/data");
  }
  void TearDown() override {
    umount2("/data", MNT_DETACH);
    unsetenv("ANDROID_PROPERTY_DIR");
  }

  void clear_properties() {
    properties_ = std::make_unique<TemporaryDir>();
    setenv("ANDROID_PROPERTY_DIR", properties_->path, 1);
  }

  // Loads the table from an fstab with this content and returns the output.
  static std::string load(const std::string& fstab) {
    const ScopedTmpfs etc("/etc");
    EXPECT_TRUE(WriteStringToFile(fstab, "/etc/recovery.fstab"));
    CapturedStdout output;
    load_volume_table();
    return output.take();
  }

  // Returns the line for /data with these fs_mgr options.
  std::string data_row(const std::string& options) const {
    return disk_.path() + " /data ext4 noatime wait," + options + "\n";
  }

  static bool data_is_ext4() {
    struct statfs status = {};
    return statfs("/data", &status) == 0 && status.f_type == EXT4_SUPER_MAGIC;
  }
  static std::string crypto_state() { return GetProperty("ro.crypto.state", ""); }
  static std::string crypto_type() { return GetProperty("ro.crypto.type", ""); }

  const sentrova::testing::LoopDevice disk_{16 << 20};

 private:
  std::unique_ptr<TemporaryDir> properties_;
};

TEST_F(Roots, LoadingMountsFileEncryptedDataAndLooksForItsKeys) {
  ASSERT_TRUE(disk_.make_ext4());
  const std::string row = data_row("fileencryption=aes-256-xts,keydirectory=/metadata/vold");
  SetProperty("ro.boot.dynamic_partitions", "true");
  SetProperty("ro.boot.slot_suffix", "_a");
  const std::string output = load(kSystemRow + row);
  EXPECT_THAT(output, HasSubstr("mount /data result: 0"));
  EXPECT_THAT(output, HasSubstr("/data/unencrypted/key/version isn't exited\n"
                                "recovery filesystem table\n"
                                "=========================\n"
                                "  0 /system  ext4 /dev/block/by-name/system_a 0\n"
                                "  1 /data  ext4 " +
                                disk_.path() + " 0\n  2 /tmp  ramdisk ramdisk 0\n"));
  EXPECT_TRUE(data_is_ext4());
  EXPECT_EQ(crypto_type() + " " + crypto_state(), "file ");
  EXPECT_TRUE(HasCache());
  ASSERT_NE(volume_for_mount_point("/mnt/system"), nullptr);
  EXPECT_EQ(volume_for_mount_point("/mnt/system")->blk_device, "/dev/block/by-name/system_a");

  // Again, with the keys there and /data still mounted.
  std::filesystem::create_directories("/data/unencrypted/key");
  ASSERT_TRUE(WriteStringToFile("1", "/data/unencrypted/key/version"));
  const std::string again = load(row);
  EXPECT_THAT(again, HasSubstr("mount /data result: -2"));
  EXPECT_THAT(again, HasSubstr("/data/unencrypted/key/version is exited\n"));
  EXPECT_EQ(crypto_state(), "encrypted");
}

TEST_F(Roots, LoadingTakesUnmountableDataForWhatTheFstabDeclares) {
  const struct {
    const char* options;
    const char* type;
    const char* state;
    const char* message;
  } cases[] = {
      {"fileencryption=aes-256-xts,keydirectory=/metadata/vold", "file", "encrypted",
       "FBE zuno_load_volume_table is metadata encryption\n"},
      {"fileencryption=aes-256-xts", "file", "",
       "FBE zuno_load_volume_table data device maybe damaged\n"},
      {"forceencrypt=footer", "block", "encrypted",
       "FDE zuno_load_volume_table data is encrypted\n"},
      {"formattable", "", "", "mount /data result: -1, error: Invalid argument\n"},
  };
  for (const auto& [options, type, state, message] : cases) {
    clear_properties();
    EXPECT_THAT(load(data_row(options)), HasSubstr(message)) << options;
    EXPECT_EQ(crypto_type(), type) << options;
    EXPECT_EQ(crypto_state(), state) << options;
    EXPECT_FALSE(data_is_ext4()) << options;
  }
}

}  // namespace
