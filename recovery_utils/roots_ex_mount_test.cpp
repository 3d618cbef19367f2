#include <android-base/properties.h>
#include <android-base/strings.h>

#include <algorithm>
#include <map>

#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_mount_test.h"

namespace {

using android::base::SetProperty;
using android::dm::DmDeviceState;
using android::fs_mgr::FstabEntry;
using sentrova::testing::fstab_row;
using sentrova::testing::KernelScript;

class VendorMount : public sentrova::testing::MountTest {
 protected:
  // Returns the messages of mounting a row at `mount_point`, which must come to `result`.
  std::string mount_row(const std::string& mount_point, int result) {
    FstabEntry row = fstab_row("/dev/block/d", mount_point, "own");
    row.flags = 9;
    row.fs_options = "options";
    platform_.calls.clear();
    return messages_of([&] { EXPECT_EQ(zuno_ensure_path_mounted(&row), result); });
  }

  long count_calls(const char* call) const {
    return std::count(platform_.calls.begin(), platform_.calls.end(), call);
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
  EXPECT_EQ(messages_of([] { EXPECT_EQ(zuno_ensure_path_mounted(nullptr), -1); }),
            "[ROOTS]I: zuno_ensure_path_mounted: Invlaid parameter\n");
  KernelScript kernel;
  for (const char* other : {"/data2", "/sdcard1", "/otgx", "/mnt/data", "/", "", "data", "/dat"}) {
    EXPECT_EQ(mount_row(other, -1), "") << other;
    EXPECT_EQ(platform_.calls, Calls{}) << other;
  }
  make_file("/dev/block/sda");
  make_file("/dev/block/mmcblk1");
  for (const char* call :
       {"/dev/block/d on /data/a as own, 9, options", "/dev/block/mmcblk1 on /sdcard/ as own, 9, ",
        "/dev/block/sda on /otg/a as vfat, 9, "}) {
    mount_row(android::base::Split(call, " ")[2], 0);
    EXPECT_EQ(platform_.calls, Calls{std::string("mount(2) ") + call});
  }
}

TEST_F(VendorMount, WaitsForDataBehindTheDeviceMapperInEachOfTwoAttempts) {
  const std::string wait = "[ROOTS]I: mounting data -> block device # is ";
  const std::map<char, std::string> lines = {
      {'D', "I roots_ex.cpp:347 zuno_ensure_path_mounted: userdata Dm device is #\n"},
      {'N', "I roots_ex.cpp:347 zuno_ensure_path_mounted: userdata Dm device is \n"},
      {'I',
       "E roots_ex.cpp:349 zuno_ensure_path_mounted: DeviceMapper state INVALID for userdata\n"},
      {'0',
       "E roots_ex.cpp:354 zuno_ensure_path_mounted: usedata Dm device miss, force set "
       "/dev/block/dm-0\n"},
      {'w', wait + "not exited , wait 200 ms !!!\n"},
      {'e', wait + "exited !!!\n"},
      {'S', "[ROOTS]I: Success to mount /data at #\n"},
      {'F', "[ROOTS]E: Fail to mount /data at # (Input/output error)\n"}};
  const auto expect = [&](const Calls& crypto, DmDeviceState state, const char* node,
                          const std::string& device, size_t appears, const std::vector<int>& errors,
                          const std::string& course) {
    SCOPED_TRACE(::testing::PrintToString(crypto) + course);
    clear_machine();
    SetProperty("ro.crypto.state", crypto[0]);
    SetProperty("ro.crypto.type", crypto[1]);
    SetProperty("ro.crypto.metadata.enabled", crypto[2]);
    device_mapper_.state = [&](auto&) { return state; };
    device_mapper_.node = [&](auto& name) { return name == "userdata" ? node : ""; };
    size_t mounts = 0;
    KernelScript kernel;
    kernel.mount_error = [&](auto&, auto&) { return errors.at(mounts++); };
    make_appear(kernel, device, appears);
    std::string expected;
    for (const char line : course) {
      expected += lines.at(line);
    }
    EXPECT_EQ(mount_row("/data", errors.back() == 0 ? 0 : -1),
              android::base::StringReplace(expected, "#", device, true));
    EXPECT_EQ(mounts, errors.size());
    EXPECT_EQ(count_calls("sleep 200000"), std::count(course.begin(), course.end(), 'w'));
  };
  const auto active = DmDeviceState::ACTIVE;
  const std::string raw = "/dev/block/d", forced = "/dev/block/dm-0", waits(24, 'w');
  const char* dm = "/dev/block/dm-3";
  const Calls fde = {"encrypted", "block", ""};
  expect({"", "block", "true"}, active, dm, raw, 99, {0}, "S");
  expect({"unencrypted", "block", "true"}, active, dm, raw, 99, {EIO, 0}, "FS");
  expect({"encrypted", "file", "false"}, active, dm, raw, 99, {EIO, EIO}, "FF");
  expect({"encrypted", "file", "1"}, DmDeviceState::SUSPENDED, dm, dm, 0, {0}, "DeS");
  expect(fde, active, dm, dm, 0, {EBUSY, 0}, "DeSeS");
  expect(fde, active, dm, dm, 0, {EIO, EBUSY}, "DeFeS");
  expect(fde, active, dm, dm, 24, {0}, "D" + waits + "eS");
  expect(fde, active, dm, dm, 25, {EIO, 0}, "D" + waits + "wFeS");
  expect(fde, active, "", forced, 0, {0}, "N0eS");
  expect({"encrypted", "", "true"}, DmDeviceState::INVALID, dm, forced, 99, {EIO, EIO},
         "I0" + waits + "wF" + waits + "wF");
}

TEST_F(VendorMount, TriesTheSdCardThreeTimesWithTwoTypes) {
  const std::string none = "[ROOTS]I: find sdcard devices (NULL)\n";
  const std::string found = "[ROOTS]I: find sdcard devices (/dev/block/mmcblk1)\n";
  const auto failed = [&](const std::string& details) {
    return "[ROOTS]E: sdcard mount fail(blk_device: /dev/block/mmcblk1, fs_type: " + details + "\n";
  };
  const auto own_failed = [&](int retry) {
    return found + failed("own, retry: " + std::to_string(retry) + ", result:-1): No such device");
  };
  const std::string exfat_failed = failed("exfat): Invalid argument");
  const auto expect = [&](size_t appears, const char* works, long sleeps,
                          const std::string& messages) {
    clear_machine();
    KernelScript kernel;
    kernel.mount_error = [&](auto&, auto& type) {
      return type == works ? 0 : type == "own" ? ENODEV : EINVAL;
    };
    make_appear(kernel, "/dev/block/mmcblk1", appears);
    EXPECT_EQ(mount_row("/sdcard", messages.ends_with("sucessed\n") ? 0 : -1), messages);
    EXPECT_EQ(count_calls("sleep 1000000"), sleeps);
  };
  expect(9, "own", 3, none + none + none);
  expect(0, "own", 0, found + "[ROOTS]I: sdcard mount sucessed\n");
  expect(1, "exfat", 1,
         none + own_failed(1) + "[ROOTS]I: sdcard mount with exfat file system sucessed\n");
  expect(
      0, "", 0,
      own_failed(0) + exfat_failed + own_failed(1) + exfat_failed + own_failed(2) + exfat_failed);
}

TEST_F(VendorMount, TriesUsbDisksPartitionFirstAndGoesOnFromABusyOne) {
  const auto expect = [&](const Calls& existing, const std::map<std::string, int>& errors,
                          int result, const Calls& expected) {
    clear_machine();
    for (const std::string& path : existing) {
      make_file(path);
    }
    Calls tried;
    KernelScript kernel;
    kernel.mount_error = [&](auto& device, auto& type) {
      tried.push_back(device.substr(device.rfind('/') + 1) + " " + type);
      return errors.contains(tried.back()) ? errors.at(tried.back()) : 0;
    };
    const std::string messages = mount_row("/otg", result);
    EXPECT_EQ(tried, expected);
    return messages;
  };
  const std::string sda1 = "/dev/block/sda1", sda = "/dev/block/sda", sdg1 = "/dev/block/sdg1",
                    sdg = "/dev/block/sdg", ufs = "/sys/ufs/ufsid";
  expect({sdg}, {}, -1, {});
  expect({sda}, {}, 0, {"sda vfat"});
  expect({sda1, sda}, {{"sda1 vfat", EIO}}, 0, {"sda1 vfat", "sda1 exfat"});
  expect({ufs, sdg1, sdg}, {{"sdg1 vfat", EBUSY}}, 0, {"sdg1 vfat", "sdg vfat"});
  EXPECT_EQ(expect({ufs, sdg1, sda1}, {{"sdg1 vfat", EIO}, {"sdg1 exfat", EBUSY}}, -1,
                   {"sdg1 vfat", "sdg1 exfat"}),
            "[ROOTS]E: zuno_mount_otg otg mount fail(blk_device: /dev/block/sdg1, fs_type: vfat): "
            "Input/output error\n"
            "[ROOTS]I: zuno_mount_otg otg mount sucess(blk_device: /dev/block/sdg1, fs_type: "
            "exfat)\n"
            "[ROOTS]I: zuno_mount_otg block device(/dev/block/sdg) is not exist.\n");
}

TEST_F(VendorMount, MountsARowOfAFreshlyReadFstab) {
  set_table({fstab_row("/dev/block/old", "/fresh")});
  bool readable = true;
  const auto expect = [&](const char* path, int mount_result, size_t calls, int result,
                          const std::string& message) {
    provide_fstab({fstab_row("/dev/block/new", "/fresh")}, readable);
    platform_.mount_one = [&](auto&) {
      errno = EIO;
      return mount_result;
    };
    platform_.calls.clear();
    std::filesystem::remove("/fresh");
    EXPECT_EQ(messages_of([&] { EXPECT_EQ(zuno_fs_mgr_do_mount_one(path), result); }),
              "[ROOTS]" + message + "\n");
    Calls expected = {"read fstab", "mount /dev/block/new at /fresh"};
    expected.resize(calls);
    EXPECT_EQ(platform_.calls, expected);
    EXPECT_EQ(std::filesystem::exists("/fresh"), calls == 2);
  };
  expect("", 0, 0, -1, "E: ensure_path_mounted_at get invalid parameters");
  expect("/other", 0, 1, -1, "E: Failed to get entry for path /other");
  const std::string done = "I: zuno_fs_mgr_do_mount_one Success mount /dev/block/new to /fresh";
  expect("/fresh/x", 0, 2, 0, done);
  expect("/fresh", -2, 2, 0, done);
  expect("/fresh", -1, 2, -1,
         "E: zuno_fs_mgr_do_mount_one Fail mount /dev/block/new to /fresh (Input/output error)");
  set_mounted("/fresh");
  expect("/fresh/x", 0, 1, 0, "I: Volume (/fresh) is already mounted");
  set_mounted("");
  expect("/fresh", 0, 1, -1, "E: Failed to scan mounted volumes");
  readable = false;
  expect("/fresh", 0, 1, -1, "E: Failed to read default fstab");
  EXPECT_EQ(blkdevice_for_mount_point("/fresh"), "/dev/block/old");
  EXPECT_EQ(blkdevice_for_mount_point("/fresh/x"), "");
}

TEST_F(VendorMount, RemovesABusyDeviceMapperDeviceWithPatience) {
  const std::string head = ": DM_DEV Cannot remove dm-crypt device dev: ";
  const std::string busy = "[ROOTS]I" + head + "Device or resource busy, retrying...\n\n";
  const auto expect = [&](const std::vector<int>& errors, const Calls& calls,
                          const std::string& messages) {
    size_t tries = 0;
    device_mapper_.delete_error = [&](auto&) { return errors.at(tries++); };
    KernelScript kernel;
    platform_.calls.clear();
    EXPECT_EQ(messages_of([&] {
                EXPECT_EQ(volume_revert_dm_device("dev"), errors.back() == 0);
                EXPECT_FALSE(volume_revert_dm_device(""));
              }),
              messages);
    EXPECT_EQ(platform_.calls, calls);
  };
  const std::string remove = "dm delete dev", wait = "sleep 100000";
  expect({0}, {remove}, "");
  expect({EBUSY, EBUSY, 0}, {remove, wait, remove, wait, remove}, busy + busy);
  expect({EBUSY, EIO}, {remove, wait, remove}, busy + "[ROOTS]E" + head + "Input/output error\n\n");
  expect(std::vector(5, EBUSY),
         {remove, wait, remove, wait, remove, wait, remove, wait, remove, wait},
         busy + busy + busy + busy + busy + "[ROOTS]E" + head + "Device or resource busy\n\n");
}

}  // namespace
