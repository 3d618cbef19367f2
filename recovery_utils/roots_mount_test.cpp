#include "recovery_utils/roots_mount_test.h"

#include <gmock/gmock.h>
#include <string.h>
#include <sys/stat.h>

namespace {

using android::fs_mgr::Fstab;
using sentrova::testing::fstab_row;
using sentrova::testing::KernelScript;
using ::testing::EndsWith;
using ::testing::StartsWith;

using MountByPath = sentrova::testing::MountTest;
using InstallMounts = sentrova::testing::MountTest;

TEST_F(MountByPath, TellsWhyThereIsNothingToMount) {
  set_table({fstab_row("/dev/block/a", "/a")});
  platform_.calls.clear();
  const auto expect = [&](const char* path, const char* at, int result, const char* message) {
    EXPECT_EQ(messages_of([&] {
                errno = EXDEV;
                EXPECT_EQ(ensure_path_mounted_at(path, at), result);
                EXPECT_EQ(errno, EXDEV);
              }),
              message);
  };
  expect("", "/a", -1, "E roots.cpp:122 ensure_path_mounted_at get invalid parameters\n");
  expect("/b/a", "/a", -1, "E roots.cpp:129 Failed to get entry for path /b/a\n");
  set_mounted("/a");
  expect("/a/b", "", 0, "I roots.cpp:143 Volume (/a) is already mounted\n");
  set_mounted("/mnt");
  expect("/a", "/mnt", 0, "I roots.cpp:143 Volume (/mnt) is already mounted\n");
  set_mounted("");
  EXPECT_EQ(messages_of([] { EXPECT_EQ(ensure_path_mounted("/a"), -1); }),
            "E roots.cpp:134 Failed to scan mounted volumes\n");
  EXPECT_EQ(platform_.calls, Calls{});
}

TEST_F(MountByPath, TurnsToTheVendorWhereThePlatformFailsOrLeavesBusyAndNeverFormats) {
  const auto expect = [&](bool formattable, bool mounted, int error, int vendor_error, int result,
                          size_t mounts) {
    SCOPED_TRACE(std::to_string(mounted) + " " + strerror(error));
    set_table({fstab_row("/dev/block/d", "/data")});
    auto& flags = volume_for_mount_point("/data")->fs_mgr_flags;
    flags.formattable = formattable;
    platform_.calls.clear();
    platform_.ensure_mounted = [&](Fstab* table, auto&, auto&) {
      EXPECT_FALSE(flags.formattable);
      flags.formattable = !formattable;
      flags.quota = true;
      table->at(0).blk_device = "/dev/block/dm-7";
      errno = error;
      return mounted;
    };
    KernelScript kernel;
    kernel.mount_error = [&](auto&, auto&) { return vendor_error; };
    const std::string messages =
        messages_of([&] { EXPECT_EQ(ensure_path_mounted("/data/f"), result); });
    EXPECT_TRUE(flags.formattable == formattable && flags.quota);
    Calls expected = {"ensure mounted /data/f at /data"};
    expected.resize(1 + mounts, "mount(2) /dev/block/dm-7 on /data as ext4, 0, ");
    EXPECT_EQ(platform_.calls, expected);
    const std::string failure =
        "E roots.cpp:165 fail to mount path /data/f(/dev/block/dm-7) at /data : " +
        std::string(strerror(error)) +
        "\nE roots.cpp:166 try to mount by zuno_ensure_path_mounted.\n[ROOTS]";
    EXPECT_THAT(messages, StartsWith(mounts == 0 ? "" : failure));
    EXPECT_EQ(messages.empty(), mounts == 0);
  };
  expect(true, true, 0, EIO, 0, 0);
  expect(false, true, EINVAL, EIO, 0, 0);
  expect(false, true, EBUSY, 0, 0, 1);
  expect(true, true, EBUSY, EIO, -1, 2);
  expect(true, false, EIO, 0, 0, 1);
  expect(false, false, EIO, EIO, -1, 2);
}

TEST_F(MountByPath, TakesTheTargetsPrefixForTheKindOfVolume) {
  set_table({fstab_row("/dev/block/d", "/data")});
  const auto expect = [&](const std::string& target, bool by_platform, bool otg) {
    platform_.calls.clear();
    umask(0);
    std::filesystem::remove(target);
    KernelScript kernel;
    const std::string messages =
        messages_of([&] { EXPECT_EQ(ensure_path_mounted_at("/data/x", target), 0); });
    Calls expected = {"ensure mounted /data/x at " + target,
                      "mount(2) /dev/block/d on /data as ext4, 0, "};  // the row's own
    expected.erase(expected.begin(), expected.begin() + (by_platform ? 0 : 1));
    EXPECT_EQ(platform_.calls, expected);
    EXPECT_EQ(messages.starts_with("[ROOTS]I: write the otg host_mode enable\n"), otg);
    EXPECT_EQ(std::filesystem::status(target).permissions(), std::filesystem::perms{0755});
  };
  in_new_process([&] {
    expect("/alt", true, false);
    expect("/sdcard", false, false);
    expect("/sdcard1", false, false);
    expect("/otgx", true, true);
    expect("/sdcar", true, false);
  });
}

TEST_F(InstallMounts, AreSetUpInOrderUpToTheFirstFailure) {
  EXPECT_EQ(messages_of([] { EXPECT_EQ(setup_install_mounts(), -1); }),
            "E roots.cpp:500 can't set up install mounts: no fstab loaded\n");
  set_table({fstab_row("s", "/"), fstab_row("ramdisk", "/tmp"), fstab_row("v", "/vendor"),
             fstab_row("o", "/otg"), fstab_row("d", "/data"), fstab_row("x", "/sdcard"),
             fstab_row("c", "/cache"), fstab_row("y", "/sdcard1")});
  const auto expect = [&](const std::string& failing, size_t calls, const char* message) {
    Calls expected = {"ensure mounted /tmp at /tmp", "ensure unmounted /vendor",
                      "ensure mounted /data at /data", "ensure mounted /cache at /cache",
                      "ensure unmounted /sdcard1"};
    expected.resize(calls);
    platform_.calls.clear();
    const auto answer = [&](auto*, const std::string& path, auto&...) {
      errno = EIO;
      return path != failing;
    };
    platform_.ensure_unmounted = answer;
    platform_.ensure_mounted = answer;
    EXPECT_THAT(messages_of([&] {
                  EXPECT_EQ(setup_install_mounts(), failing.empty() ? 0 : -1);
                  EXPECT_EQ(errno, EIO);
                }),
                EndsWith(message));
    EXPECT_EQ(platform_.calls, expected);
  };
  expect("", 5, "");
  expect("/vendor", 2, "E roots.cpp:518 Failed to unmount /vendor\n");
  expect("/cache", 4, "E roots.cpp:513 Failed to mount /cache\n");
  expect("/sdcard1", 5, "E roots.cpp:518 Failed to unmount /sdcard1\n");
}

}  // namespace
