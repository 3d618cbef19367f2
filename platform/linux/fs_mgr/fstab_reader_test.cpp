#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/properties.h>
#include <android-base/strings.h>
#include <fs_mgr.h>
#include <fstab/fstab.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <limits>

namespace {

using android::base::SetProperty;
using android::base::WriteStringToFile;
using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using android::fs_mgr::ReadFstabFromFile;

class FstabReader : public testing::Test {
 protected:
  // Properties live as long as the process where no store is shared, and "ro." ones are written
  // once: each test has a store of its own.
  FstabReader() { setenv("ANDROID_PROPERTY_DIR", properties_.path, 1); }
  ~FstabReader() override { unsetenv("ANDROID_PROPERTY_DIR"); }

  bool read(const std::string& text) {
    return WriteStringToFile(text, file_.path) && ReadFstabFromFile(file_.path, &fstab_);
  }

  // Reads one line with these fs_mgr options; no row when it is refused.
  bool read_options(const std::string& options) {
    fstab_.clear();
    return read("/dev/block/a /a ext4 ro " + options + "\n") && fstab_.size() == 1;
  }

  TemporaryDir properties_;
  TemporaryFile file_;
  Fstab fstab_;
};

TEST_F(FstabReader, TakesFieldsCommentsAndBlankLinesInOrder) {
  fstab_.resize(3);
  ASSERT_TRUE(
      read("# comment\n\n   \t\n"
           "\t/dev/block/by-name/a  /a\text4\tnoatime,nosuid,barrier=1,rw,,data=ordered   wait  # "
           "extra\r\n"
           "  # /dev/block/by-name/x /x ext4 ro wait\n"
           "/dev/block/by-name/c none emmc ro,bind,lazytime,#odd ,"));
  ASSERT_EQ(fstab_.size(), 2U);
  EXPECT_EQ(fstab_[0].blk_device + " " + fstab_[0].mount_point + " " + fstab_[0].fs_type,
            "/dev/block/by-name/a /a ext4");
  EXPECT_EQ(fstab_[0].flags, static_cast<unsigned long>(MS_NOATIME | MS_NOSUID));
  EXPECT_EQ(fstab_[0].fs_options, "barrier=1,data=ordered");
  EXPECT_TRUE(fstab_[0].fs_mgr_flags.wait);
  EXPECT_EQ(fstab_[1].flags, static_cast<unsigned long>(MS_RDONLY | MS_BIND | MS_LAZYTIME));
  EXPECT_EQ(fstab_[1].fs_options, "#odd");
  EXPECT_FALSE(fstab_[1].fs_mgr_flags.wait);
}

TEST_F(FstabReader, TakesValuesOfOptions) {
  using Entry = const FstabEntry&;
  const std::pair<const char*, bool (*)(Entry)> kCases[] = {
      {"encryptable=/dev/block/key",
       [](Entry e) { return e.key_loc == "/dev/block/key" && e.is_encryptable(); }},
      {"forcefdeorfbe=/key",
       [](Entry e) {
         return e.key_loc == "/key" && e.encryption_options == "aes-256-xts" &&
                e.fs_mgr_flags.force_fde_or_fbe;
       }},
      {"forceencrypt=footer",
       [](Entry e) { return e.key_loc == "footer" && e.fs_mgr_flags.force_crypt; }},
      {"fileencryption=a:b:v2+c",
       [](Entry e) {
         return e.encryption_options == "a:b:v2+c" && e.fs_mgr_flags.file_encryption &&
                !e.is_encryptable();
       }},
      {"keydirectory=/metadata/k", [](Entry e) { return e.metadata_key_dir == "/metadata/k"; }},
      {"metadata_encryption=a:w", [](Entry e) { return e.metadata_encryption == "a:w"; }},
      {"length=-16384", [](Entry e) { return e.length == -16384; }},
      {"length=-9223372036854775808",
       [](Entry e) { return e.length == std::numeric_limits<off64_t>::min(); }},
      {"reservedsize=128M", [](Entry e) { return e.reserved_size == 128 << 20; }},
      {"eraseblk=524288,logicalblk=0x1000",
       [](Entry e) { return e.erase_blk_size == 524288 && e.logical_blk_size == 4096; }},
      {"voldmanaged=sdcard1:3", [](Entry e) { return e.label == "sdcard1" && e.partnum == 3; }},
      {"voldmanaged=usb:auto", [](Entry e) { return e.label == "usb" && e.partnum == -1; }},
      {"zramsize=1g,swapprio=-2",
       [](Entry e) { return e.zram_size == 1 << 30 && e.swap_prio == -2; }},
  };
  for (const auto& [options, holds] : kCases) {
    ASSERT_TRUE(read_options(options)) << options;
    EXPECT_TRUE(holds(fstab_[0])) << options;
  }
  ASSERT_TRUE(read_options("wait=yes,Wait,vendor=1,formattable")) << "unknown ones are passed over";
  EXPECT_FALSE(fstab_[0].fs_mgr_flags.wait);
  EXPECT_TRUE(fstab_[0].fs_mgr_flags.formattable);
}

TEST_F(FstabReader, RefusesAMalformedLineAndNamesItAndKeepsTheTable) {
  static std::string log;
  android::base::SetLogger([](auto, auto, auto, auto, auto, const char* text) { log += text; });
  const std::string rest =
      "length= length length=12k length=9223372036854775808 eraseblk=2048 eraseblk=5000 "
      "eraseblk=-4096 logicalblk=0 logicalblk=4kk reservedsize= reservedsize=-1 reservedsize=8e "
      "reservedsize=1m1 zramsize=101% zramsize=-1% zramsize=% "
      "zram_backingdev_size=99999999999999999999 voldmanaged=sd voldmanaged=:auto "
      "voldmanaged=sd:x voldmanaged=sd:-1 swapprio=2147483648 max_comp_streams=-1 "
      "checkpoint=other keydirectory= encryptable= sysfs_path= slotselect slotselect_other";
  std::vector<std::string> lines = {"/dev/block/b", "/dev/block/b /b ext4 ro"};
  for (const std::string& option : android::base::Split(rest, " ")) {
    lines.push_back("/dev/block/b /b ext4 ro wait," + option);
  }
  const std::string good = "/dev/block/a /a ext4 ro wait\n\n";
  for (const std::string& line : lines) {
    log.clear();
    fstab_.assign(2, FstabEntry());
    EXPECT_FALSE(read(good + line + "\n" + good)) << line;
    EXPECT_EQ(log.rfind(std::string(file_.path) + ":3: ", 0), 0U) << line << ": " << log;
    EXPECT_EQ(fstab_.size(), 2U) << line;
    EXPECT_EQ(fstab_[1].blk_device, "") << line;
  }
  android::base::SetLogger(android::base::StderrLogger);
}

TEST_F(FstabReader, SlotsFollowTheProperties) {
  EXPECT_EQ(fs_mgr_get_slot_suffix() + fs_mgr_get_super_partition_name(), "super");
  ASSERT_TRUE(SetProperty("ro.boot.slot", "a"));
  EXPECT_EQ(fs_mgr_get_slot_suffix(), "_a");
  ASSERT_TRUE(SetProperty("ro.boot.slot_suffix", "_b"));
  ASSERT_TRUE(SetProperty("ro.boot.super_partition", "store"));
  EXPECT_EQ(fs_mgr_get_super_partition_name() + fs_mgr_get_super_partition_name(0),
            "store_bstore_a");
  ASSERT_TRUE(
      read("/dev/block/by-name/boot /boot emmc defaults slotselect\n"
           "/dev/block/by-name/boot /other emmc defaults slotselect_other\n"
           "system /system ext4 ro slotselect,logical\n"
           "product /product ext4 ro logical\n"));
  EXPECT_EQ(fstab_[0].blk_device, "/dev/block/by-name/boot_b");
  EXPECT_EQ(fstab_[1].blk_device, "/dev/block/by-name/boot_a");
  EXPECT_EQ(fstab_[2].logical_partition_name, "system_b");
  EXPECT_EQ(fstab_[3].logical_partition_name, "product");
}

TEST_F(FstabReader, RefusesWhatIsNoTextFileOfReasonableSize) {
  const std::string line = "/dev/block/a /a ext4 ro wait\n";
  const std::string fifo = properties_.path + std::string("/fifo");
  ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
  fstab_.resize(1);
  const std::string texts[] = {line + std::string(1, '\0') + line,
                               line + std::string(256 * 1024 + 1 - line.size(), '\n')};
  for (const std::string& text : texts) {
    EXPECT_FALSE(read(text)) << text.size();
  }
  for (const char* const path : {fifo.c_str(), "/dev/zero", "/", "/nonexistent/fstab"}) {
    EXPECT_FALSE(ReadFstabFromFile(path, &fstab_)) << path;
  }
  EXPECT_EQ(fstab_.size(), 1U);
  EXPECT_TRUE(read(line + std::string(256 * 1024 - line.size(), '\n')));
}

}  // namespace
