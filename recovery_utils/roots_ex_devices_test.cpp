#include <errno.h>

#include "recovery_utils/roots_test.h"

namespace sentrova::testing {
namespace {

constexpr char kUfs[] = "/sys/ufs/ufsid";
constexpr char kUsb[] = "/dev/usb_row";  // the device of the row for /otg

using SdCard = RootsTest;

TEST_F(SdCard, IsTheFirstDeviceThatExists) {
  const std::string first = "/dev/block/mmcblk0p1", part = "/dev/block/mmcblk1p1",
                    disk = "/dev/block/mmcblk1", row = "/dev/row";
  const std::pair<Texts, std::string> cases[] = {
      {{first}, ""},  // the device's own storage where that is not UFS
      {{kUfs, first, part, disk, row}, first},
      {{kUfs, part, disk, row}, part},
      {{first, disk, row}, disk},
      {{kUfs, row}, row},
  };
  for (const auto& [existing, found] : cases) {
    clear_machine();
    for (const std::string& path : existing) {
      make_file(path);
    }
    set_table({fstab_row(row, "/sdcard")});
    EXPECT_EQ(output_of(zuno_search_sdcard_device, found),
              "[ROOTS]I: find sdcard devices (" + (found.empty() ? "NULL" : found) + ")\n");
    EXPECT_EQ(zuno_find_sdcard_device(), !found.empty());
  }
}

class OtgDevice : public RootsTest {
 protected:
  // Begins with this chip and these files.
  void set_machine(const std::string& solution, const std::string& platform, const Texts& files) {
    rmdir("/otg");
    clear_machine();
    set_table({fstab_row(kUsb, "/otg")});
    if (!solution.empty()) {
      SetProperty("ro.zuno.product.solution", solution);
    }
    SetProperty("ro.zuno.product.platform", platform);
    std::filesystem::create_directories("/sys/devices/platform");
    for (const std::string& path : files) {
      make_file(path);
    }
  }
  static std::string enable(bool expected) { return output_of(zuno_enable_otg_device, expected); }

  static std::string absent(const std::string& device) {
    return "[ROOTS]E: can't find otg device " + device + ", wait 1s\n";
  }
};

constexpr char kFile1[] = "/sys/bus/platform/drivers/msm-dwc3/a800000.ssusb/host_mode";
constexpr char kFile2[] = "/sys/devices/platform/soc/a600000.ssusb/host_mode";
constexpr char kFile3[] = "/sys/devices/platform/soc/4e00000.ssusb/host_mode";
constexpr char kFile4[] = "/sys/devices/virtual/dwc3_vusb/usb0/host_mode";
constexpr char kFile7[] = "/sys/devices/platform/otg_iddig/host_mode";
constexpr char kFile9[] = "/sys/devices/platform/extcon_usb/host_mode";
constexpr char kFile10[] = "/sys/devices/platform/usb_notifier/host_mode";
constexpr char kOther[] = "/sys/devices/platform/a/b/host_mode";  // only a search finds it

TEST_F(OtgDevice, HostModeIsSwitchedOnByTheChipsOwnFile) {
  const struct {
    std::string solution;
    std::string platform;
    Texts existing;
    std::string file;  // the one that is written to; it fails where this does not exist
  } cases[] = {
      {"QCOM", "SDM660", {kFile1, kOther}, kFile1},
      {"QCOM", "SM7250", {kFile2, kOther}, kFile2},
      {"QCOM", "SM6125", {kFile3, kOther}, kFile3},
      {"QCOM", "SM7125", {kFile4, kOther}, kFile4},
      {"MTK", "MTK6885", {kFile9, kOther}, kFile9},
      {"MTK", "MTK6771", {kFile7, kOther}, kFile7},
      {"SAMSUNG", "SM8250", {kFile10, kFile2}, kFile10},
      {"", "SM8250", {kFile2, kOther}, kFile2},  // QCOM where nothing is said
      // A search, because the chip is not known or its file is not there.
      {"QCOM", "SM8250", {kFile4, kOther}, kOther},
      {"QCOM", "MTK6885", {kFile4, kOther}, kOther},
      {"OTHER", "SM8250", {kFile4, kOther}, kOther},
      // Each maker's last resort, which a search does not see.
      {"QCOM", "SM8250", {kFile4}, kFile4},
      {"MTK", "", {}, kFile9},
      {"OTHER", "SM8250", {kFile4}, ""},
  };
  for (const auto& chip : cases) {
    SCOPED_TRACE(chip.solution + " " + chip.platform + " " + chip.file);
    set_machine(chip.solution, chip.platform, chip.existing);
    make_file(kUsb);
    in_new_process([&] {
      const KernelScript kernel;
      const std::string found =
          "[ROOTS]I: write the otg host_mode enable\n[ROOTS]I: Find the otg otg enable file: " +
          chip.file + "\n";
      if (chip.file.empty()) {
        EXPECT_THAT(enable(false), EndsWith("[ROOTS]E: Failed to find otg enable file\n"));
      } else if (chip.existing.empty()) {
        EXPECT_EQ(enable(false), found + "[ROOTS]E: Failed to write enable to " + chip.file +
                                     " (No such file or directory)\n");
      } else {
        EXPECT_THAT(enable(true), StartsWith(found));
      }
      for (const std::string& path : chip.existing) {
        EXPECT_EQ(content_of(path), path == chip.file ? "enabled" : "") << path;
      }
    });
  }
}

TEST_F(OtgDevice, KeepsTheFileThatItFoundAndMakesTheMountPoint) {
  set_machine("QCOM", "SM8250", {kOther, kUsb});
  in_new_process([&] {
    const KernelScript kernel;
    enable(true);
    EXPECT_EQ(std::filesystem::status("/otg").permissions(), std::filesystem::perms{0750});
    make_file(kOther);  // empty again
    make_file(kFile2);  // the better one, too late
    enable(true);
    EXPECT_EQ(content_of(kOther) + "," + content_of(kFile2), "enabled,");
    set_table({});
    EXPECT_THAT(enable(false), EndsWith("[ROOTS]E: can't find Volume for /otg\n"));
  });
}

TEST_F(OtgDevice, ReportsAbsentDevicesInEveryFifthPassOfAMinute) {
  const std::string pass = "sleep 200000\n";
  const std::string found = "sleep 1000000\n[ROOTS]I: find otg device /dev/block/sda\n";
  const std::string partitions = absent(kUsb) + absent("/dev/block/sda1");
  const std::string five = repeat(4, pass) + partitions + absent("/dev/block/sda") + pass;
  // The disk, last of the three, is there from the next pass on; at the end it never comes.
  const std::pair<size_t, std::string> cases[] = {
      {3, repeat(3, pass) + found},
      {4, repeat(4, pass) + partitions + found},
      {5, five + found},
      {300, repeat(60, five) + "[ROOTS]I: wait otg device end...\n"}};
  for (const auto& [passes, end] : cases) {
    set_machine("QCOM", "SM8250", {kFile2, "/dev/block/sdg1"});  // sdg: of UFS devices only
    in_new_process([&, passes = passes, end = end] {
      KernelScript kernel;
      kernel.on_sleep = [&](size_t count) {
        if (count == passes) {
          make_file("/dev/block/sda");
        }
      };
      EXPECT_THAT(enable(passes < 300), EndsWith("[ROOTS]I: wait otg device start...\n" + end));
    });
  }
}

TEST_F(OtgDevice, WaitsOnForADiskThatVanishesWithinItsSecond) {
  set_machine("QCOM", "SM8250", {kFile2, kUfs, "/dev/block/sdg1"});
  in_new_process([&] {
    KernelScript kernel;
    kernel.on_sleep = [](size_t count) {
      std::filesystem::remove("/dev/block/sdg1");
      if (count == 2) {
        make_file("/dev/block/sdg");
      }
    };
    EXPECT_THAT(enable(true), EndsWith("[ROOTS]I: wait otg device start...\nsleep 1000000\n"
                                       "sleep 200000\nsleep 1000000\n"
                                       "[ROOTS]I: find otg device /dev/block/sdg\n"));
  });
}

TEST_F(OtgDevice, EveryCallOnMtkAndSamsungPutsTwoMoreDevicesInFront) {
  for (const std::string solution : {"MTK", "SAMSUNG"}) {
    set_machine(solution, "MTK6885", {kFile9, kFile10});
    in_new_process([&] {
      const KernelScript kernel;
      const std::string passes = repeat(4, "sleep 200000\n") + absent(kUsb);
      EXPECT_THAT(enable(false), HasSubstr(passes + absent("/dev/block/sda1")))
          << "grown, but not in use";
      make_file(kUfs);
      const std::string grown = absent("/dev/block/sdd1") + absent("/dev/block/sdd");
      for (const size_t calls : {2U, 3U}) {
        EXPECT_THAT(enable(false),
                    HasSubstr("[ROOTS]I: checked run in " + solution +
                              " platform, insert sdd otg device list into regular otg "
                              "list\n[ROOTS]I: wait otg device start...\n" +
                              passes + repeat(calls, grown) + absent("/dev/block/sdg1") +
                              absent("/dev/block/sdg") + "sleep 200000\n"));
      }
      make_file("/dev/block/sdd1");
      EXPECT_THAT(output_of([] { zuno_ensure_path_mounted(volume_for_mount_point("/otg")); }),
                  HasSubstr("mount(2) /dev/block/sdd1 on /otg as vfat"))
          << "where it was found, it is mounted from";
    });
  }
}

}  // namespace
}  // namespace sentrova::testing
