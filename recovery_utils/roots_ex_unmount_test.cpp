#include <gmock/gmock.h>

#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_mount_test.h"

namespace {

using sentrova::testing::fstab_row;
using sentrova::testing::KernelScript;

using ForcedUnmount = sentrova::testing::MountTest;
using InstallUnmounts = sentrova::testing::MountTest;

TEST_F(ForcedUnmount, FollowsAPlainFailureAndCombinesItsTwoSteps) {
  const std::string released = "[ZUNO_MOUNT]I: unmounting /data succeeded\n";
  const std::string failed = "[ROOTS]I: force umount volume /data :Failed...\n";
  set_table({fstab_row("/dev/block/d", "/data")});
  int umount_error = 0;
  // `plain_results` are those of the platform's unmounts.
  const auto expect = [&](const char* path, bool force, const std::vector<bool>& plain_results,
                          int result, const std::string& messages) {
    size_t plain = 0;
    platform_.ensure_unmounted = [&](auto*, auto& asked) {
      EXPECT_EQ(asked, path);
      return plain_results.at(plain++);
    };
    KernelScript kernel;
    kernel.umount_error = [&](auto&) { return umount_error; };
    EXPECT_EQ(messages_of([&] { EXPECT_EQ(ensure_path_unmounted(path, force), result); }),
              messages);
    EXPECT_EQ(plain, plain_results.size());
  };
  expect("/data/x", true, {true}, 0, "");
  expect("/data/x", false, {false}, -1, "");
  expect("/b", true, {false}, -1, "[ROOTS]E: fail to force umount unknown volume for path /b\n");
  expect("/data/x", true, {false}, 0, "[ROOTS]W: can't find mounted volume by mount_point /data\n");
  set_mounted("/data");
  expect("/data/x", true, {false, true}, 0,
         released + "[ROOTS]I: force umount volume /data :Success...\n");
  expect("/data/x", true, {false, false}, -1, released + failed);
  umount_error = EBUSY;
  expect("/data/x", true, {false, true}, -1,
         "[ZUNO_MOUNT]W: sending SIGHUP to processes with open files\n"
         "[ZUNO_MOUNT]W: sending SIGKILL to processes with open files\n"
         "[ZUNO_MOUNT]E: unmounting /data failed: Device or resource busy\n" +
             failed);
  set_mounted("");
  expect("/data/x", true, {false}, -1, "[ROOTS]I: scan_mounted_volumes Failed\n" + failed);
}

TEST_F(InstallUnmounts, VisitAllButThreeVolumesWhateverBecomesOfEach) {
  EXPECT_THAT(messages_of([] { EXPECT_EQ(setup_install_unmounts(), -1); }),
              ::testing::EndsWith("\nE:can't set up install unmounts: no fstab loaded"));
  set_table({fstab_row("s", "/"), fstab_row("ramdisk", "/tmp"), fstab_row("d", "/data"),
             fstab_row("v", "/vendor"), fstab_row("c", "/cache"), fstab_row("x", "/cache2")});
  set_mounted("/data");
  platform_.calls.clear();
  platform_.ensure_unmounted = [](auto*, auto& path) { return path == "/cache2"; };
  KernelScript kernel;
  EXPECT_EQ(messages_of([] { EXPECT_EQ(setup_install_unmounts(), 0); }),
            "[ZUNO_MOUNT]I: unmounting /data succeeded\n"
            "[ROOTS]I: force umount volume /data :Failed...\n"
            "I:Failed to unmount /data\n"
            "[ROOTS]W: can't find mounted volume by mount_point /vendor\n"
            "I:Unmount /vendor success.\n"
            "I:Unmount /cache2 success.\n");
  EXPECT_EQ(platform_.calls,
            (Calls{"ensure unmounted /data", "umount(2) /data", "ensure unmounted /data",
                   "ensure unmounted /vendor", "ensure unmounted /cache2"}));
}

}  // namespace
