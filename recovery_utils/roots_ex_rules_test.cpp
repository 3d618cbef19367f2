#include <android-base/strings.h>
#include <string.h>

#include <iostream>

#include "recovery_utils/roots_test.h"

namespace sentrova::testing {
namespace {

class VolumeTable : public RootsTest {
 protected:
  // "/otg vfat /dev/block/sda1" for each row.
  static Texts texts(const Fstab& table) {
    Texts result;
    for (const FstabEntry& row : table) {
      result.push_back(row.mount_point + " " + row.fs_type + " " + row.blk_device);
    }
    return result;
  }
};

TEST_F(VolumeTable, IsListedAfterTheVendorLinesAndBeforeTheRootCheck) {
  Fstab rows = {fstab_row("/dev/block/by-name/system", "/system"),
                fstab_row("/dev/block/by-name/userdata", "/userdata", "f2fs")};
  rows[1].length = -16384;
  provide_fstab(rows);
  SetProperty("ro.boot.dynamic_partitions", "true");
  // The process may have its own ideas about std::cout.
  in_new_process([&] {
    std::ios::sync_with_stdio(false);
    std::cout << std::hex << std::showbase;
    EXPECT_EQ(output_of(load_volume_table),
              "read fstab\n"
              "[ROOTS]I: find sdcard devices (NULL)\n"
              "[ROOTS]E: zuno_load_volume_table Fail to find data entry in fstab\n"
              "recovery filesystem table\n"
              "=========================\n"
              "  0 /system  ext4 /dev/block/by-name/system 0\n"
              "  1 /userdata  f2fs /dev/block/by-name/userdata -16384\n"
              "  2 /tmp  ramdisk ramdisk 0\n"
              "  3 /cache  ext4 /dev/block/by-name/logdata 0\n"
              "  4 /otg  vfat /dev/block/sda1 0\n"
              "  5 /sdcard  vfat  0\n"
              "\n");
    EXPECT_EQ(get_fstab_default().size(), 7U);
    EXPECT_EQ(get_fstab_default().back().mount_point, "/mnt/system");
  });
}

TEST_F(VolumeTable, IsLeftAsAFailedReadLeftItAndReadAgainWhileEmpty) {
  EXPECT_THAT(get_fstab_default(), IsEmpty());
  provide_fstab({fstab_row("/dev/block/half", "/half")}, false);
  EXPECT_EQ(output_of([] { return get_fstab_default().size(); }, 1U),
            "read fstab\nE roots_load.cpp:60 Failed to read default fstab\n");
  EXPECT_EQ(output_of([] { get_fstab_default()[0].blk_device = "copy"; }), "")
      << "the table is no longer empty";
  EXPECT_EQ(volume_for_mount_point("/half")->blk_device, "/dev/block/half");
}

TEST_F(VolumeTable, TellsForGoodWhetherItHadACacheOnceItHasARow) {
  EXPECT_DEATH(HasCache(), "roots\\.cpp:527\\] Check failed: !fstab\\.empty\\(\\) \n");
  for (const bool expected : {true, false}) {
    in_new_process([&] {
      for (const bool has_cache : {expected, !expected}) {
        set_table({fstab_row("/dev/block/a", has_cache ? "/cache" : "/cache2")});
        EXPECT_EQ(HasCache(), expected);
      }
    });
  }
}

TEST_F(VolumeTable, GetsTheRowsForRemovableMediaThatTheFstabLacks) {
  const auto load = [](Fstab table) {
    EXPECT_THAT(output_of([&] { zuno_load_volume_table(table); }), Not(HasSubstr("mount ")));
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
}

TEST_F(VolumeTable, ClassifiesDataByItsFlagsTheMountAndTheKeys) {
  const std::string keys = "I: FBE # /data/unencrypted/key/version is exited\n";
  const std::string no_keys = "I: FBE # /data/unencrypted/key/version isn't exited\n";
  const std::string metadata = "I: FBE # is metadata encryption\n";
  const std::string damaged = "E: FBE # data device maybe damaged\n";
  const std::string fde = "I: FDE # data is encrypted\n";
  const struct {
    std::string flags;  // f: file, c: crypt, F: force_crypt, b: force_fde_or_fbe, m: key directory
    const char* type_before;
    int mount_result;
    int mount_error;
    bool has_keys;
    std::string type_and_state;
    std::string last_line;  // after those about the mount; # stands for the rule's name
  } cases[] = {
      {"m", "", -1, EINVAL, false, " ", ""},
      {"f", "", -2, EBUSY, true, "file encrypted", keys},
      {"fcFb", "", 0, 0, false, "file ", no_keys},
      {"fm", "", -1, EINVAL, false, "file encrypted", metadata},
      {"fm", "", -1, EACCES, false, "file ", damaged},
      {"f", "", -1, EINVAL, true, "file ", damaged},
      {"c", "", -1, EINVAL, false, "block encrypted", fde},
      {"F", "", -1, EACCES, false, "block encrypted", fde},
      {"c", "", 0, 0, true, "block ", ""},
      {"", "file", 0, 0, true, "file encrypted", keys},  // set before, for good
      {"bm", "file", -1, EINVAL, false, "file encrypted", metadata},
      {"cm", "file", -1, EINVAL, false, "file ", damaged},
      {"", "none", -1, EINVAL, false, "none ", ""},
  };
  for (const auto& c : cases) {
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
    platform_.mount_one = [&](auto&) { return errno = c.mount_error, c.mount_result; };
    std::string expected;
    if (c.flags.find_first_of("fcFb") != std::string::npos) {
      expected = std::string("[ROOTS]I: # this deives is support ") +
                 (has('f') ? "file" : "block") + " encrypted\n";
    }
    expected +=
        "mount /dev/u at /data\n[ROOTS]I: # mount /data result: " + std::to_string(c.mount_result) +
        ", error: " + strerror(c.mount_error) + "\n";
    if (c.mount_result != -1) {
      expected += "[ROOTS]I: # Success mount /data to /dev/u \n\n";
    }
    expected += c.last_line.empty() ? "" : "[ROOTS]" + c.last_line;
    EXPECT_EQ(output_of([&] { zuno_load_volume_table(table); }),
              android::base::StringReplace(expected, "#", "zuno_load_volume_table", true));
    EXPECT_EQ(GetProperty("ro.crypto.type", "") + " " + GetProperty("ro.crypto.state", ""),
              c.type_and_state);
  }
}

TEST_F(VolumeTable, GetsTheSystemsRowByTheRootCheck) {
  const std::string short_root = "/system ext4 vda1";  // too short to name the partition
  // "MOUNT_POINT TYPE DEVICE" each, and the row that is appended, if any. The slot is _a.
  const std::pair<Texts, std::string> cases[] = {
      {{"/system ext4 /dev/system_a"}, "/mnt/system ext4 /dev/system_a"},
      {{"/system ext4 system_a", "system_a ext4 /dev/system_a"}, "/mnt/system ext4 system_a"},
      {{"/system ext4 /dev/mysystem_a"}, ""},
      {{"/system ext4 /dev/system_b"}, ""},
      {{"/vendor ext4 /dev/system_a"}, ""},
      {{"/mnt/system ext4 /dev/system_a", "/system ext4 /dev/x/system_a"}, ""},
      {{short_root}, "/mnt/system ext4 vda1"},
      {{short_root, "/mnt/system ext4 /dev/system_b"}, "/mnt/system ext4 vda1"},
      {{short_root, "system_a ext4 /dev/system_a"}, "/mnt/system ext4 /dev/system_a"},
      {{short_root, "system_a ext4 /dev/block/vda2"}, ""},
  };
  const auto check_root = [](const Texts& rows, const std::string& property) {
    SetProperty(property, "true");
    SetProperty("ro.boot.slot_suffix", "_a");
    Fstab table;
    for (const std::string& row : rows) {
      const auto words = android::base::Split(row, " ");
      table.push_back(fstab_row(words[2], words[0], words[1]));
    }
    EXPECT_EQ(output_of([&] { zuno_try_update_fstab_for_root_check(table); }), "");
    return texts(table);
  };
  for (const auto& [rows, appended] : cases) {
    for (const char* property :
         {"ro.other", "ro.build.system_root_image", "ro.boot.dynamic_partitions"}) {
      clear_machine();
      Texts expected = rows;
      if (!appended.empty() && property != std::string("ro.other")) {
        expected.push_back(appended);
      }
      EXPECT_EQ(check_root(rows, property), expected) << property;
    }
  }
  clear_machine();
  // The row of the other slot is overwritten.
  EXPECT_THAT(check_root({"/mnt/system f2fs /dev/system_b", "/system erofs /dev/system_a"},
                         "ro.build.system_root_image"),
              ElementsAre("/mnt/system erofs /dev/system_a", "/system erofs /dev/system_a"));
}

}  // namespace
}  // namespace sentrova::testing
