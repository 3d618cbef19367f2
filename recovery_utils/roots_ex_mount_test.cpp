#include <android-base/strings.h>

#include <map>

#include "recovery_utils/roots_test.h"

namespace sentrova::testing {
namespace {

using android::base::StringReplace;

class VendorMount : public RootsTest {
 protected:
  // Returns the output of mounting a row at `mount_point`, which must come to `result`.
  static std::string mount_row(const std::string& mount_point, int result) {
    FstabEntry row = fstab_row("/dev/block/d", mount_point, "own");
    row.flags = 9;
    row.fs_options = "options";
    return output_of([&] { return zuno_ensure_path_mounted(&row); }, result);
  }

  // Makes `path` appear during this sleep; 0: at once.
  static void make_appear(KernelScript& kernel, const std::string& path, size_t at) {
    kernel.on_sleep = [=](size_t count) {
      if (count == at) {
        make_file(path);
      }
    };
    kernel.on_sleep(0);
  }
};

TEST_F(VendorMount, KnowsItsVolumesByWholeDirectories) {
  EXPECT_EQ(output_of([] { return zuno_ensure_path_mounted(nullptr); }, -1),
            "[ROOTS]I: zuno_ensure_path_mounted: Invlaid parameter\n");
  const KernelScript kernel;
  for (const char* other : {"/data2", "/sdcard1", "/otgx", "/mnt/data", "/", "", "data", "/dat"}) {
    EXPECT_EQ(mount_row(other, -1), "") << other;
  }
  make_file("/dev/block/sda");
  make_file("/dev/block/mmcblk1");
  for (const std::string call : {"d on /data/a as own, 9, options",
                                 "mmcblk1 on /sdcard/ as own, 9, ", "sda on /otg/a as vfat, 9, "}) {
    EXPECT_THAT(mount_row(android::base::Split(call, " ")[2], 0),
                HasSubstr("mount(2) /dev/block/" + call + "\n"));
  }
}

TEST_F(VendorMount, WaitsForDataBehindTheDeviceMapperInEachOfTwoAttempts) {
  const std::string wait = "[ROOTS]I: mounting data -> block device # is ";
  const std::string call = "mount(2) # on /data as own, 9, options\n";
  const std::map<char, std::string> lines = {
      {'D',
       "dm state userdata\ndm path userdata\n"
       "I roots_ex.cpp:347 zuno_ensure_path_mounted: userdata Dm device is #\n"},
      {'N',
       "dm state userdata\ndm path userdata\n"
       "I roots_ex.cpp:347 zuno_ensure_path_mounted: userdata Dm device is \n"},
      {'I',
       "dm state userdata\n"
       "E roots_ex.cpp:349 zuno_ensure_path_mounted: DeviceMapper state INVALID for userdata\n"},
      {'0',
       "E roots_ex.cpp:354 zuno_ensure_path_mounted: usedata Dm device miss, force set "
       "/dev/block/dm-0\n"},
      {'w', wait + "not exited , wait 200 ms !!!\nsleep 200000\n"},
      {'e', wait + "exited !!!\n"},
      {'S', call + "[ROOTS]I: Success to mount /data at #\n"},
      {'F', call + "[ROOTS]E: Fail to mount /data at # (Input/output error)\n"}};
  const auto active = DmDeviceState::ACTIVE;
  const std::string raw = "/dev/block/d", forced = "/dev/block/dm-0", waits(24, 'w');
  const char* dm = "/dev/block/dm-3";
  const Texts fde = {"encrypted", "block", ""};
  const struct {
    Texts crypto;  // state, type, metadata encryption
    DmDeviceState state;
    const char* node;
    std::string device;  // that is mounted
    size_t appears;      // in that sleep
    std::vector<int> errors;
    std::string course;
  } cases[] = {
      {{"", "block", "true"}, active, dm, raw, 99, {0}, "S"},
      {{"encrypted", "file", "false"}, active, dm, raw, 99, {EIO, EIO}, "FF"},
      {{"encrypted", "file", "1"}, DmDeviceState::SUSPENDED, dm, dm, 0, {0}, "DeS"},
      {fde, active, dm, dm, 0, {EIO, EBUSY}, "DeFeS"},
      {fde, active, dm, dm, 24, {0}, "D" + waits + "eS"},
      {fde, active, dm, dm, 25, {EIO, 0}, "D" + waits + "wFeS"},
      {fde, active, "", forced, 0, {EBUSY, 0}, "N0eSeS"},
      {fde, DmDeviceState::INVALID, dm, forced, 99, {EIO, EIO}, "I0" + waits + "wF" + waits + "wF"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(::testing::PrintToString(c.crypto) + c.course);
    clear_machine();
    SetProperty("ro.crypto.state", c.crypto[0]);
    SetProperty("ro.crypto.type", c.crypto[1]);
    SetProperty("ro.crypto.metadata.enabled", c.crypto[2]);
    platform_.dm_state = [&](auto&) { return c.state; };
    platform_.dm_node = [&](auto& name) { return name == "userdata" ? c.node : ""; };
    size_t mounts = 0;
    KernelScript kernel;
    kernel.mount_error = [&](auto&, auto&) { return c.errors.at(mounts++); };
    make_appear(kernel, c.device, c.appears);
    std::string expected;
    for (const char line : c.course) {
      expected += lines.at(line);
    }
    EXPECT_EQ(mount_row("/data", c.errors.back() == 0 ? 0 : -1),
              StringReplace(expected, "#", c.device, true));
  }
}

TEST_F(VendorMount, TriesTheSdCardThreeTimesWithTwoTypes) {
  const std::string failed =
      "[ROOTS]E: sdcard mount fail(blk_device: /dev/block/mmcblk1, fs_type: ";
  const std::string exfat = "mount(2) /dev/block/mmcblk1 on /sdcard as exfat, 9, \n";
  const std::map<char, std::string> lines = {
      {'N', "[ROOTS]I: find sdcard devices (NULL)\nsleep 1000000\n"},
      {'D',
       "[ROOTS]I: find sdcard devices (/dev/block/mmcblk1)\n"
       "mount(2) /dev/block/mmcblk1 on /sdcard as own, 9, \n"},
      {'S', "[ROOTS]I: sdcard mount sucessed\n"},
      {'0', failed + "own, retry: 0, result:-1): No such device\n"},
      {'1', failed + "own, retry: 1, result:-1): No such device\n"},
      {'2', failed + "own, retry: 2, result:-1): No such device\n"},
      {'E', exfat + "[ROOTS]I: sdcard mount with exfat file system sucessed\n"},
      {'x', exfat + failed + "exfat): Invalid argument\n"}};
  const struct {
    size_t appears;     // in that sleep
    const char* works;  // "": no type
    const char* course;
  } cases[] = {{9, "", "NNN"}, {0, "own", "DS"}, {1, "exfat", "ND1E"}, {0, "", "D0xD1xD2x"}};
  for (const auto& c : cases) {
    clear_machine();
    KernelScript kernel;
    kernel.mount_error = [&](auto&, auto& type) {
      return type == c.works ? 0 : type == "own" ? ENODEV : EINVAL;
    };
    make_appear(kernel, "/dev/block/mmcblk1", c.appears);
    std::string expected;
    for (const char line : std::string(c.course)) {
      expected += lines.at(line);
    }
    EXPECT_EQ(mount_row("/sdcard", *c.works != '\0' ? 0 : -1), expected);
  }
}

TEST_F(VendorMount, TriesUsbDisksPartitionFirstAndGoesOnFromABusyOne) {
  const auto expect = [&](const Texts& existing, const std::map<std::string, int>& errors,
                          int result, const Texts& expected) {
    clear_machine();
    for (const std::string& name : existing) {
      make_file(name == "ufs" ? "/sys/ufs/ufsid" : "/dev/block/" + name);
    }
    Texts tried;
    KernelScript kernel;
    kernel.mount_error = [&](auto& device, auto& type) {
      tried.push_back(device.substr(device.rfind('/') + 1) + " " + type);
      return errors.contains(tried.back()) ? errors.at(tried.back()) : 0;
    };
    const std::string messages = mount_row("/otg", result);
    EXPECT_EQ(tried, expected);
    return messages;
  };
  expect({"sdg"}, {}, -1, {});
  expect({"sda1", "sda"}, {{"sda1 vfat", EIO}}, 0, {"sda1 vfat", "sda1 exfat"});
  expect({"ufs", "sdg1", "sdg"}, {{"sdg1 vfat", EBUSY}}, 0, {"sdg1 vfat", "sdg vfat"});
  EXPECT_EQ(expect({"ufs", "sdg1", "sda1"}, {{"sdg1 vfat", EIO}, {"sdg1 exfat", EBUSY}}, -1,
                   {"sdg1 vfat", "sdg1 exfat"}),
            "mount(2) /dev/block/sdg1 on /otg as vfat, 9, \n"
            "[ROOTS]E: zuno_mount_otg otg mount fail(blk_device: /dev/block/sdg1, fs_type: vfat): "
            "Input/output error\n"
            "mount(2) /dev/block/sdg1 on /otg as exfat, 9, \n"
            "[ROOTS]I: zuno_mount_otg otg mount sucess(blk_device: /dev/block/sdg1, fs_type: "
            "exfat)\n"
            "[ROOTS]I: zuno_mount_otg block device(/dev/block/sdg) is not exist.\n");
}

TEST_F(VendorMount, MountsARowOfAFreshlyReadFstab) {
  set_table({fstab_row("/dev/block/old", "/fresh")});
  const std::string read = "read fstab\n", mount = read + "mount /dev/block/new at /fresh\n";
  const auto expect = [&](const char* path, int mount_result, int result, const std::string& calls,
                          const std::string& message) {
    platform_.mount_one = [&](auto&) { return errno = EIO, mount_result; };
    std::filesystem::remove("/fresh");
    EXPECT_EQ(output_of([&] { return zuno_fs_mgr_do_mount_one(path); }, result),
              calls + "[ROOTS]" + message + "\n");
    EXPECT_EQ(std::filesystem::exists("/fresh"), calls == mount);
  };
  provide_fstab({fstab_row("/dev/block/new", "/fresh")});
  expect("", 0, -1, "", "E: ensure_path_mounted_at get invalid parameters");
  expect("/other", 0, -1, read, "E: Failed to get entry for path /other");
  const std::string done = "I: zuno_fs_mgr_do_mount_one Success mount /dev/block/new to /fresh";
  expect("/fresh/x", 0, 0, mount, done);
  expect("/fresh", -2, 0, mount, done);
  expect("/fresh", -1, -1, mount,
         "E: zuno_fs_mgr_do_mount_one Fail mount /dev/block/new to /fresh (Input/output error)");
  set_mounted("/fresh");
  expect("/fresh/x", 0, 0, read, "I: Volume (/fresh) is already mounted");
  set_mounted("");
  expect("/fresh", 0, -1, read, "E: Failed to scan mounted volumes");
  provide_fstab({fstab_row("/dev/block/new", "/fresh")}, false);
  expect("/fresh", 0, -1, read, "E: Failed to read default fstab");
  EXPECT_EQ(blkdevice_for_mount_point("/fresh"), "/dev/block/old");
  EXPECT_EQ(blkdevice_for_mount_point("/fresh/x"), "");
}

TEST_F(VendorMount, RemovesABusyDeviceMapperDeviceWithPatience) {
  const std::string head = ": DM_DEV Cannot remove dm-crypt device dev: ";
  const KernelScript kernel;
  for (const std::vector<int>& errors :
       {std::vector{0}, {EBUSY, EBUSY, 0}, {EBUSY, EIO}, std::vector(5, EBUSY)}) {
    size_t tries = 0;
    platform_.dm_delete_error = [&](auto&) { return errors.at(tries++); };
    std::string expected;
    for (const int error : errors) {
      expected += "dm delete dev\n";
      if (error == EBUSY) {
        expected += "[ROOTS]I" + head + "Device or resource busy, retrying...\n\nsleep 100000\n";
      }
    }
    if (errors.back() != 0) {
      expected += "[ROOTS]E" + head + strerror(errors.back()) + "\n\n";
    }
    EXPECT_EQ(output_of([] { return volume_revert_dm_device("dev"); }, errors.back() == 0),
              expected);
  }
  EXPECT_EQ(output_of([] { return volume_revert_dm_device(""); }, false), "");
}

}  // namespace
}  // namespace sentrova::testing
