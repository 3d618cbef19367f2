#include <android-base/properties.h>
#include <gmock/gmock.h>

#include <iostream>

#include "recovery_utils/roots_test.h"

namespace {

using android::fs_mgr::FstabEntry;
using sentrova::testing::fstab_row;
using ::testing::IsEmpty;

using LoadVolumeTable = sentrova::testing::RootsTest;

TEST_F(LoadVolumeTable, ListsAllRowsAfterTheVendorLinesAndBeforeTheRootCheck) {
  android::fs_mgr::Fstab rows = {fstab_row("/dev/block/by-name/system", "/system"),
                                 fstab_row("/dev/block/by-name/userdata", "/userdata", "f2fs")};
  rows[1].length = -16384;
  provide_fstab(rows);
  android::base::SetProperty("ro.boot.dynamic_partitions", "true");
  // The process may have its own ideas about std::cout.
  in_new_process([&] {
    std::ios::sync_with_stdio(false);
    std::cout << std::hex << std::showbase;
    EXPECT_EQ(output_of(load_volume_table),
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

TEST_F(LoadVolumeTable, LeavesWhatAFailedReadLeftAndRetriesAnEmptyTable) {
  EXPECT_THAT(get_fstab_default(), IsEmpty());
  provide_fstab({fstab_row("/dev/block/half", "/half")}, false);
  std::string log;
  android::base::SetLogger([&](auto, auto, auto, auto, auto, const char* text) { log += text; });
  EXPECT_EQ(output_of([] { EXPECT_EQ(get_fstab_default().size(), 1U); }), "");
  android::base::SetLogger(android::base::StderrLogger);
  EXPECT_EQ(log, "Failed to read default fstab");
  get_fstab_default()[0].blk_device = "copy";
  EXPECT_EQ(volume_for_mount_point("/half")->blk_device, "/dev/block/half");
  EXPECT_EQ(platform_.calls.size(), 2U);  // the table is no longer empty
}

TEST_F(LoadVolumeTable, LooksUpByExactMountPointAndByNearestAncestor) {
  set_table({fstab_row("first", "/cache"), fstab_row("second", "/cache"), fstab_row("x", "/a/b")});
  const auto device_of = [](const FstabEntry* row) { return row ? row->blk_device : "(none)"; };
  const std::vector<std::string> cases[] = {{"/cache", "first", "first"},
                                            {"/cache/a/b", "(none)", "first"},
                                            {"/cached", "(none)", "(none)"},
                                            {"/a", "(none)", "(none)"}};
  for (const auto& c : cases) {
    EXPECT_EQ(device_of(volume_for_mount_point(c[0])), c[1]) << c[0];
    EXPECT_EQ(device_of(zuno_volume_for_path(c[0])), c[2]) << c[0];
  }
}

TEST_F(LoadVolumeTable, KeepsTheFirstAnswerOfHasCacheOnceThereIsATable) {
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

}  // namespace
