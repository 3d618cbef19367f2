#include <android-base/properties.h>
#include <errno.h>
#include <gmock/gmock.h>

#include <map>

#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_test.h"
#include "tests/support/sleep_script.h"

namespace {

using android::base::SetProperty;
using sentrova::testing::fstab_row;
using sentrova::testing::RootsTest;
using sentrova::testing::SleepScript;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr int64_t kSecond = 1'000'000;
constexpr int64_t kPass = 200'000;

using SdCard = RootsTest;

TEST_F(SdCard, IsTheFirstDeviceThatExists) {
  const std::string ufs = "/sys/ufs/ufsid", first = "/dev/block/mmcblk0p1",
                    part = "/dev/block/mmcblk1p1", disk = "/dev/block/mmcblk1", row = "/dev/row";
  const std::pair<std::vector<std::string>, std::string> cases[] = {
      {{first}, ""},  // the device's own storage where that is not UFS
      {{ufs, first, part, disk, row}, first},
      {{ufs, part, disk, row}, part},
      {{first, part, disk, row}, part},
      {{first, disk, row}, disk},
      {{ufs, row}, row},
  };
  for (const auto& the_case : cases) {
    const std::string& found = the_case.second;
    SCOPED_TRACE(::testing::PrintToString(the_case.first));
    clear_machine();
    for (const std::string& path : the_case.first) {
      make_file(path);
    }
    set_table({fstab_row(row, "/sdcard")});
    EXPECT_EQ(output_of([&] { EXPECT_EQ(zuno_search_sdcard_device(), found); }),
              "[ROOTS]I: find sdcard devices (" + (found.empty() ? "NULL" : found) + ")\n");
    EXPECT_EQ(zuno_find_sdcard_device(), !found.empty());
  }
}

constexpr char kUsb[] = "/dev/usb_row";  // the device of the row for /otg

class OtgDevice : public RootsTest {
 protected:
  void SetUp() override {
    RootsTest::SetUp();
    if (!IsSkipped()) {
      rmdir("/otg");
      set_table({fstab_row(kUsb, "/otg")});
    }
  }

  // Begins with this chip and these files.
  void set_machine(const std::string& solution, const std::string& platform,
                   const std::vector<std::string>& files) {
    clear_machine();
    if (!solution.empty()) {
      SetProperty("ro.zuno.product.solution", solution);
    }
    SetProperty("ro.zuno.product.platform", platform);
    for (const std::string& path : files) {
      make_file(path);
    }
  }
  static std::string content_of(const std::string& path) {
    std::string content;
    return android::base::ReadFileToString(path, &content) ? content : "(none)";
  }
  // Returns the output of a call with the given result.
  static std::string enable(bool expected) {
    return output_of([&] { EXPECT_EQ(zuno_enable_otg_device(), expected); });
  }
  // The devices that one of so many equal reports of absent ones names, in order.
  static std::vector<std::string> reported_devices(const std::string& output, size_t reports) {
    std::vector<std::string> devices;
    constexpr std::string_view kBefore = "can't find otg device ";
    for (size_t at = 0; (at = output.find(kBefore, at)) != std::string::npos;) {
      at += kBefore.size();
      devices.push_back(output.substr(at, output.find(',', at) - at));
    }
    EXPECT_EQ(devices.size() % reports, 0U);
    devices.resize(devices.size() / reports);
    return devices;
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

const struct {
  std::string solution;
  std::string platform;
  std::vector<std::string> existing;
  std::string file;  // the one that is written to; it fails where this does not exist
} kChips[] = {
    {"QCOM", "SDM660", {kFile1, kOther}, kFile1},
    {"QCOM", "SDM710", {kFile2, kOther}, kFile2},
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
    {"SAMSUNG", "", {}, kFile10},
    {"OTHER", "SM8250", {kFile4}, ""},
};

TEST_F(OtgDevice, HostModeIsSwitchedOnByTheChipsOwnFile) {
  for (const auto& chip : kChips) {
    SCOPED_TRACE(chip.solution + " " + chip.platform + " " +
                 ::testing::PrintToString(chip.existing));
    set_machine(chip.solution, chip.platform, chip.existing);
    make_file(kUsb);
    in_new_process([&] {
      SleepScript sleeps;
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
    SleepScript sleeps;
    enable(true);
    EXPECT_EQ(std::filesystem::status("/otg").permissions(), std::filesystem::perms{0750});
    make_file(kOther);  // empty again
    make_file(kFile2);  // the better one, too late
    enable(true);
    EXPECT_EQ(content_of(kOther), "enabled");
    EXPECT_EQ(content_of(kFile2), "");
    set_table({});
    EXPECT_THAT(enable(false), EndsWith("[ROOTS]E: can't find Volume for /otg\n"));
  });
}

TEST_F(OtgDevice, ReportsAbsentDevicesInEveryFifthPassOfAMinute) {
  // The disk, last of the three, is there from the next pass on; at the end it never comes.
  const std::map<size_t, size_t> reports_by_passes = {{3, 0}, {4, 2}, {5, 3}, {10, 6}, {300, 180}};
  for (const auto& [passes, reports] : reports_by_passes) {
    SCOPED_TRACE(passes);
    set_machine("QCOM", "SM8250", {kFile2, "/dev/block/sdg1"});  // sdg: of UFS devices only
    in_new_process([&, passes = passes, reports = reports] {
      SleepScript sleeps([&](size_t count) {
        if (count == passes) {
          make_file("/dev/block/sda");
        }
      });
      const bool comes = passes < 300;
      const std::string output = enable(comes);
      EXPECT_THAT(reported_devices(output, 1), SizeIs(reports));
      EXPECT_THAT(output, EndsWith(comes ? "[ROOTS]I: find otg device /dev/block/sda\n"
                                         : "[ROOTS]I: wait otg device end...\n"));
      std::vector<int64_t> expected(passes, kPass);
      if (comes) {
        expected.push_back(kSecond);
      }
      EXPECT_EQ(sleeps.microseconds(), expected);
    });
  }
}

TEST_F(OtgDevice, WaitsOnForADiskThatVanishesWithinItsSecond) {
  set_machine("QCOM", "SM8250", {kFile2, "/sys/ufs/ufsid", "/dev/block/sdg1"});
  in_new_process([&] {
    SleepScript sleeps([](size_t count) {
      if (count == 1) {
        std::filesystem::remove("/dev/block/sdg1");
      } else if (count == 2) {
        make_file("/dev/block/sdg");
      }
    });
    EXPECT_THAT(enable(true), EndsWith("[ROOTS]I: wait otg device start...\n"
                                       "[ROOTS]I: find otg device /dev/block/sdg\n"));
    EXPECT_THAT(sleeps.microseconds(), ElementsAre(kSecond, kPass, kSecond));
  });
}

TEST_F(OtgDevice, EveryCallOnMtkAndSamsungPutsTwoMoreDevicesInFront) {
  for (const char* solution : {"MTK", "SAMSUNG"}) {
    set_machine(solution, "MTK6885", {kFile9, kFile10});
    in_new_process([&] {
      SleepScript sleeps;
      std::vector<std::string> expected = {kUsb, "/dev/block/sda1", "/dev/block/sda"};
      EXPECT_EQ(reported_devices(enable(false), 60), expected);  // grown, but not in use
      make_file("/sys/ufs/ufsid");
      expected = {kUsb, "/dev/block/sdd1", "/dev/block/sdd", "/dev/block/sdg1", "/dev/block/sdg"};
      for (int call = 2; call <= 3; ++call) {
        const std::string output = enable(false);
        EXPECT_THAT(output, HasSubstr(std::string("[ROOTS]I: checked run in ") + solution +
                                      " platform, insert sdd otg device list into regular otg "
                                      "list\n[ROOTS]I: wait otg device start...\n"));
        expected.insert(expected.begin() + 1, {"/dev/block/sdd1", "/dev/block/sdd"});
        EXPECT_EQ(reported_devices(output, 60), expected);
      }
      make_file("/dev/block/sdd1");
      EXPECT_THAT(output_of([] { zuno_ensure_path_mounted(volume_for_mount_point("/otg")); }),
                  HasSubstr("otg mount fail(blk_device: /dev/block/sdd1, fs_type: vfat)"))
          << "where it was found, it is mounted from";
    });
  }
}

}  // namespace
