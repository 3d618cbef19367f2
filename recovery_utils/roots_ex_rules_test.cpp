#include <android-base/properties.h>
#include <android-base/strings.h>
#include <errno.h>
#include <gmock/gmock.h>
#include <string.h>

#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_test.h"

namespace {

using android::base::GetProperty;
using android::base::SetProperty;
using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using sentrova::testing::fstab_row;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

using Texts = std::vector<std::string>;
using TableRules = sentrova::testing::RootsTest;

// "/otg vfat /dev/block/sda1" for each row.
Texts texts(const Fstab& table) {
  Texts result;
  for (const FstabEntry& row : table) {
    result.push_back(row.mount_point + " " + row.fs_type + " " + row.blk_device);
  }
  return result;
}

TEST_F(TableRules, AddRowsForRemovableMediaThatTheFstabLacks) {
  const auto load = [](Fstab table) {
    output_of([&] { zuno_load_volume_table(table); });
    return texts(table);
  };
  EXPECT_THAT(load({}), IsEmpty());
  EXPECT_THAT(load({fstab_row("a", "/a")}),
              ElementsAre("/a ext4 a", "/otg vfat /dev/block/sda1", "/sdcard vfat "));
  make_file("/sys/ufs/ufsid");
  make_file("/dev/block/mmcblk0p1");
  EXPECT_THAT(load({fstab_row("card", "/sdcard")}),
              ElementsAre("/sdcard ext4 card", "/otg vfat /dev/block/sdg1"));
  EXPECT_THAT(load({fstab_row("usb", "/otg", "exfat")}),
              ElementsAre("/otg exfat usb", "/sdcard vfat /dev/block/mmcblk0p1"));
  EXPECT_THAT(platform_.calls, IsEmpty());  // nothing is mounted
}

constexpr char kKeysLine[] = "I: FBE # /data/unencrypted/key/version is exited\n";
constexpr char kNoKeysLine[] = "I: FBE # /data/unencrypted/key/version isn't exited\n";
constexpr char kMetadataLine[] = "I: FBE # is metadata encryption\n";
constexpr char kDamagedLine[] = "E: FBE # data device maybe damaged\n";
constexpr char kFdeLine[] = "I: FDE # data is encrypted\n";

const struct {
  std::string flags;  // f: file, c: crypt, F: force_crypt, b: force_fde_or_fbe, m: key directory
  const char* type_before;
  int mount_result;
  int mount_error;
  bool has_keys;
  std::string type_and_state;
  std::string last_line;  // after those about the mount; "" for none; # stands for the rule's name
} kEncryptions[] = {
    {"", "", 0, 0, true, " ", ""},
    {"m", "", -1, EINVAL, false, " ", ""},
    {"f", "", 0, 0, true, "file encrypted", kKeysLine},
    {"f", "", -2, EBUSY, true, "file encrypted", kKeysLine},
    {"fcFb", "", 0, 0, false, "file ", kNoKeysLine},
    {"fm", "", -1, EINVAL, false, "file encrypted", kMetadataLine},
    {"fm", "", -1, EACCES, false, "file ", kDamagedLine},
    {"f", "", -1, EINVAL, true, "file ", kDamagedLine},
    {"c", "", -1, EINVAL, false, "block encrypted", kFdeLine},
    {"F", "", -1, EACCES, false, "block encrypted", kFdeLine},
    {"c", "", 0, 0, true, "block ", ""},
    {"", "file", 0, 0, true, "file encrypted", kKeysLine},  // set before, for good
    {"b", "file", -1, EINVAL, false, "file ", kDamagedLine},
    {"bm", "file", -1, EINVAL, false, "file encrypted", kMetadataLine},
    {"cm", "file", -1, EINVAL, false, "file ", kDamagedLine},
    {"", "none", -1, EINVAL, false, "none ", ""},
};

TEST_F(TableRules, ClassifyDataByItsFlagsTheMountAndTheKeys) {
  for (const auto& c : kEncryptions) {
    SCOPED_TRACE(c.flags + " " + c.type_before + " " + strerror(c.mount_error));
    clear_machine();
    const auto has = [&](char flag) { return c.flags.find(flag) != std::string::npos; };
    Fstab table = {fstab_row("/dev/u", "/data"), fstab_row("", "/otg"), fstab_row("", "/sdcard")};
    table[0].fs_mgr_flags.file_encryption = has('f');
    table[0].fs_mgr_flags.crypt = has('c');
    table[0].fs_mgr_flags.force_crypt = has('F');
    table[0].fs_mgr_flags.force_fde_or_fbe = has('b');
    table[0].metadata_key_dir = has('m') ? "/metadata/vold" : "";
    if (*c.type_before != '\0') {
      SetProperty("ro.crypto.type", c.type_before);
    }
    if (c.has_keys) {
      make_file("/data/unencrypted/key/version");
    }
    platform_.calls.clear();
    platform_.mount_one = [&](const FstabEntry&) {
      errno = c.mount_error;
      return c.mount_result;
    };
    const std::string output = output_of([&] { zuno_load_volume_table(table); });
    std::string expected;
    if (c.flags.find_first_of("fcFb") != std::string::npos) {
      expected = std::string("[ROOTS]I: # this deives is support ") +
                 (has('f') ? "file" : "block") + " encrypted\n";
    }
    expected += "[ROOTS]I: # mount /data result: " + std::to_string(c.mount_result) +
                ", error: " + strerror(c.mount_error) + "\n";
    if (c.mount_result != -1) {
      expected += "[ROOTS]I: # Success mount /data to /dev/u \n\n";
    }
    expected += c.last_line.empty() ? "" : "[ROOTS]" + c.last_line;
    EXPECT_EQ(output, android::base::StringReplace(expected, "#", "zuno_load_volume_table", true));
    EXPECT_EQ(GetProperty("ro.crypto.type", "") + " " + GetProperty("ro.crypto.state", ""),
              c.type_and_state);
    EXPECT_THAT(platform_.calls, ElementsAre("mount /dev/u at /data"));
  }
}

// "MOUNT_POINT TYPE DEVICE" each. The system root is /system and the slot _a in all of them.
const struct {
  Texts before;
  Texts after;  // empty: the same
} kRootChecks[] = {
    {{"/system ext4 /dev/system_a"},
     {"/system ext4 /dev/system_a", "/mnt/system ext4 /dev/system_a"}},
    {{"/system ext4 system_a"}, {"/system ext4 system_a", "/mnt/system ext4 system_a"}},
    {{"/system ext4 /dev/mysystem_a"}, {}},
    {{"/system ext4 /dev/system_b"}, {}},
    {{"/system ext4 /dev/system_a/x"}, {}},
    {{"/vendor ext4 /dev/system_a"}, {}},
    {{"/mnt/system ext4 /dev/system_a", "/system ext4 /dev/x/system_a"}, {}},
    // The row of the other slot is overwritten.
    {{"/mnt/system f2fs /dev/system_b", "/system erofs /dev/system_a"},
     {"/mnt/system erofs /dev/system_a", "/system erofs /dev/system_a"}},
    // A device too short to name the partition.
    {{"/system ext4 vda1"}, {"/system ext4 vda1", "/mnt/system ext4 vda1"}},
    {{"/system ext4 vda1", "/mnt/system ext4 /dev/system_b"},
     {"/system ext4 vda1", "/mnt/system ext4 /dev/system_b", "/mnt/system ext4 vda1"}},
    {{"/system ext4 vda1", "system_a ext4 /dev/system_a"},
     {"/system ext4 vda1", "system_a ext4 /dev/system_a", "/mnt/system ext4 /dev/system_a"}},
    {{"/system ext4 vda1", "system_a ext4 /dev/block/vda2"}, {}},
};

TEST_F(TableRules, RootCheckGivesTheSystemItsRow) {
  for (const auto& [before, after] : kRootChecks) {
    SCOPED_TRACE(::testing::PrintToString(before));
    Fstab original;
    for (const std::string& text : before) {
      const auto words = android::base::Split(text, " ");
      original.push_back(fstab_row(words[2], words[0], words[1]));
    }
    for (const char* property :
         {"ro.build.system_root_image", "ro.boot.dynamic_partitions", "ro.other"}) {
      clear_machine();
      SetProperty(property, "true");
      SetProperty("ro.boot.slot_suffix", "_a");
      Fstab table = original;
      EXPECT_EQ(output_of([&] { zuno_try_update_fstab_for_root_check(table); }), "");
      const bool applies = !after.empty() && property != std::string("ro.other");
      EXPECT_EQ(texts(table), applies ? after : before) << property;
    }
  }
}

}  // namespace
