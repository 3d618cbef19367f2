#include <string.h>
#include <sys/stat.h>

#include <tuple>

#include "recovery_utils/roots_test.h"

namespace sentrova::testing {
namespace {

using MountByPath = RootsTest;

TEST_F(MountByPath, TellsWhyThereIsNothingToMount) {
  set_table({fstab_row("/dev/block/a", "/a")});
  const auto expect = [](const char* path, const char* at, int result, const char* message) {
    EXPECT_EQ(output_of([&] { return ensure_path_mounted_at(path, at); }, result), message);
  };
  expect("", "/a", -1, "E roots.cpp:122 ensure_path_mounted_at get invalid parameters\n");
  expect("/b/a", "/a", -1, "E roots.cpp:129 Failed to get entry for path /b/a\n");
  set_mounted("/a");
  expect("/a/b", "", 0, "I roots.cpp:143 Volume (/a) is already mounted\n");
  set_mounted("/mnt");
  expect("/a", "/mnt", 0, "I roots.cpp:143 Volume (/mnt) is already mounted\n");
  set_mounted("");
  expect("/a", "", -1, "E roots.cpp:134 Failed to scan mounted volumes\n");
}

TEST_F(MountByPath, TurnsToTheVendorWhereThePlatformFailsOrLeavesBusyAndNeverFormats) {
  for (const auto& [formattable, mounted, error, vendor_error, vendor_mounts] :
       {std::tuple(true, true, 0, EIO, 0),
        {false, true, EINVAL, EIO, 0},
        {true, true, EBUSY, EIO, 2},
        {false, true, EBUSY, 0, 1},
        {true, false, EIO, 0, 1}}) {
    SCOPED_TRACE(std::to_string(mounted) + " " + strerror(error));
    set_table({fstab_row("/dev/block/d", "/data")});
    auto& flags = volume_for_mount_point("/data")->fs_mgr_flags;
    const bool before = flags.formattable = formattable;
    platform_.ensure_mounted = [&, mounted = mounted, error = error](auto* table, auto&, auto&) {
      EXPECT_FALSE(flags.formattable);
      flags.formattable = !before;
      flags.quota = true;
      table->at(0).blk_device = "/dev/block/dm-7";
      errno = error;
      return mounted;
    };
    KernelScript kernel;
    kernel.mount_error = [vendor_error = vendor_error](auto&, auto&) { return vendor_error; };
    const std::string output =
        output_of([] { return ensure_path_mounted("/data/f"); }, vendor_mounts == 2 ? -1 : 0);
    EXPECT_TRUE(flags.formattable == before && flags.quota);
    std::string expected = "ensure mounted /data/f at /data\n";
    if (vendor_mounts > 0) {
      expected += "E roots.cpp:165 fail to mount path /data/f(/dev/block/dm-7) at /data : " +
                  std::string(strerror(error)) +
                  "\nE roots.cpp:166 try to mount by zuno_ensure_path_mounted.\n";
    }
    const std::string call = "mount(2) /dev/block/dm-7 on /data as ext4, 0, \n[ROOTS]";
    expected +=
        vendor_error == 0
            ? call + "I: Success to mount /data at /dev/block/dm-7\n"
            : repeat(static_cast<size_t>(vendor_mounts),
                     call + "E: Fail to mount /data at /dev/block/dm-7 (Input/output error)\n");
    EXPECT_EQ(output, expected);
  }
}

TEST_F(MountByPath, TakesTheTargetsPrefixForTheKindOfVolume) {
  set_table({fstab_row("/dev/block/d", "/data")});
  umask(0);
  in_new_process([&] {
    const KernelScript kernel;
    for (const std::string target : {"/alt", "/sdcard", "/sdcard1", "/otgx", "/sdcar"}) {
      std::filesystem::remove(target);
      const std::string messages =
          output_of([&] { return ensure_path_mounted_at("/data/x", target); }, 0);
      EXPECT_THAT(messages, HasSubstr("mount(2) /dev/block/d on /data as ext4, 0, \n"));
      const size_t by_platform = messages.find("ensure mounted /data/x at " + target + "\n");
      EXPECT_EQ(by_platform == std::string::npos, target.starts_with("/sdcard"));
      EXPECT_EQ(messages.starts_with("[ROOTS]I: write the otg host_mode enable\n"),
                target == "/otgx");
      EXPECT_EQ(std::filesystem::status(target).permissions(), std::filesystem::perms{0755});
    }
  });
}

TEST_F(MountByPath, SetsUpForAnInstallationInOrderUpToTheFirstFailure) {
  EXPECT_EQ(output_of(setup_install_mounts, -1),
            "E roots.cpp:500 can't set up install mounts: no fstab loaded\n");
  set_table({fstab_row("s", "/"), fstab_row("ramdisk", "/tmp"), fstab_row("v", "/vendor"),
             fstab_row("o", "/otg"), fstab_row("d", "/data"), fstab_row("x", "/sdcard"),
             fstab_row("c", "/cache"), fstab_row("y", "/sdcard1")});
  const auto expect = [&](const std::string& failing, const std::string& output) {
    const auto answer = [&](auto*, auto& path, auto&...) { return errno = EIO, path != failing; };
    platform_.ensure_unmounted = answer;
    platform_.ensure_mounted = answer;
    EXPECT_EQ(output_of(setup_install_mounts, failing.empty() ? 0 : -1), output);
  };
  const std::string to_vendor = "ensure mounted /tmp at /tmp\nensure unmounted /vendor\n";
  const std::string to_cache =
      to_vendor + "ensure mounted /data at /data\nensure mounted /cache at /cache\n";
  expect("", to_cache + "ensure unmounted /sdcard1\n");
  expect("/vendor", to_vendor + "E roots.cpp:518 Failed to unmount /vendor\n");
  expect("/cache",
         to_cache +
             "E roots.cpp:165 fail to mount path /cache(c) at /cache : Input/output error\n"
             "E roots.cpp:166 try to mount by zuno_ensure_path_mounted.\n"
             "E roots.cpp:513 Failed to mount /cache\n");
}

TEST_F(MountByPath, UnmountsByForceAfterAPlainFailureAndCombinesTheTwoSteps) {
  set_table({fstab_row("/dev/block/d", "/data")});
  int umount_error = 0;
  // `plain_results` are those of the platform's unmounts.
  const auto expect = [&](const char* path, bool force, std::vector<bool> plain_results, int result,
                          const std::string& output) {
    size_t plain = 0;
    platform_.ensure_unmounted = [&](auto...) { return plain_results.at(plain++); };
    KernelScript kernel;
    kernel.umount_error = [&](auto&) { return umount_error; };
    EXPECT_EQ(output_of([&] { return ensure_path_unmounted(path, force); }, result), output);
  };
  const std::string tried = "ensure unmounted /data/x\n";
  const std::string released = "umount(2) /data\n[ZUNO_MOUNT]I: unmounting /data succeeded\n";
  const std::string failed = "[ROOTS]I: force umount volume /data :Failed...\n";
  const std::string busy = "umount(2) /data\nsleep 100000\n";
  expect("/data/x", true, {true}, 0, tried);
  expect("/data/x", false, {false}, -1, tried);
  expect("/b", true, {false}, -1,
         "ensure unmounted /b\n[ROOTS]E: fail to force umount unknown volume for path /b\n");
  expect("/data/x", true, {false}, 0,
         tried + "[ROOTS]W: can't find mounted volume by mount_point /data\n");
  set_mounted("/data");
  expect("/data/x", true, {false, true}, 0,
         tried + released + tried + "[ROOTS]I: force umount volume /data :Success...\n");
  expect("/data/x", true, {false, false}, -1, tried + released + tried + failed);
  umount_error = EBUSY;
  expect("/data/x", true, {false, true}, -1,
         tried + repeat(20, busy) +
             "umount(2) /data\n[ZUNO_MOUNT]W: sending SIGHUP to processes with open files\n"
             "sleep 100000\n" +
             repeat(4, busy) +
             "umount(2) /data\n[ZUNO_MOUNT]W: sending SIGKILL to processes with open files\n"
             "sleep 100000\n" +
             repeat(4, busy) + "[ZUNO_MOUNT]E: unmounting /data failed: Device or resource busy\n" +
             tried + failed);
  set_mounted("");
  expect("/data/x", true, {false}, -1, tried + "[ROOTS]I: scan_mounted_volumes Failed\n" + failed);
}

TEST_F(MountByPath, UnmountsAllButThreeVolumesForAnInstallationWhateverBecomesOfEach) {
  EXPECT_THAT(output_of(setup_install_unmounts, -1),
              EndsWith("\nE:can't set up install unmounts: no fstab loaded"));
  set_table({fstab_row("s", "/"), fstab_row("ramdisk", "/tmp"), fstab_row("d", "/data"),
             fstab_row("v", "/vendor"), fstab_row("c", "/cache"), fstab_row("x", "/cache2")});
  set_mounted("/data");
  platform_.ensure_unmounted = [](auto*, auto& path) { return path == "/cache2"; };
  const KernelScript kernel;
  EXPECT_EQ(output_of(setup_install_unmounts, 0),
            "ensure unmounted /data\numount(2) /data\n"
            "[ZUNO_MOUNT]I: unmounting /data succeeded\n"
            "ensure unmounted /data\n[ROOTS]I: force umount volume /data :Failed...\n"
            "I:Failed to unmount /data\n"
            "ensure unmounted /vendor\n"
            "[ROOTS]W: can't find mounted volume by mount_point /vendor\n"
            "I:Unmount /vendor success.\n"
            "ensure unmounted /cache2\nI:Unmount /cache2 success.\n");
}

}  // namespace
}  // namespace sentrova::testing
