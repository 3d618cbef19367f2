#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/strings.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <libdm/dm.h>
#include <stdlib.h>
#include <sys/mount.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "tests/support/captured_stdout.h"
#include "tests/support/holder.h"
#include "tests/support/loop_device.h"
#include "tests/support/private_mounts.h"

namespace sentrova::testing {
namespace {

namespace fs = std::filesystem;

using android::base::WriteStringToFile;
using android::dm::DeviceMapper;
using android::dm::DmTable;
using android::dm::DmTargetCrypt;
using std::chrono::milliseconds;
using std::chrono::steady_clock;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;

constexpr int kRounds = 5;
constexpr int64_t kDiskBytes = 64 << 20;
constexpr char kUserdata[] = "userdata";
constexpr char kCard[] = "/dev/block/mmcblk1p1";
constexpr char kUsbPartition[] = "/dev/block/sda1";
constexpr char kUsbDisk[] = "/dev/block/sda";
constexpr char kPort[] = "/sys/devices/platform/soc/a600000.ssusb";

bool format(const std::string& type, const std::string& device) {
  if (type == "ext4") {
    return run_program({"/system/bin/mke2fs", "-q", "-F", "-t", "ext4", device}) == 0;
  }
  const std::string tool = type == "f2fs" ? "make_f2fs" : "mkfs." + type;
  return run_program({"/system/bin/" + tool, device}) == 0;
}

// Puts a disk behind the encrypting device of user data; returns its node, empty on failure.
std::string map_userdata(const LoopDevice& disk) {
  DmTable table;
  table.Emplace<DmTargetCrypt>(0U, uint64_t{kDiskBytes / 512}, "aes-xts-plain64",
                               std::string(128, '5'), 0U, disk.path(), 0U);
  std::string node;
  DeviceMapper::Instance().CreateDevice(kUserdata, table, &node, std::chrono::seconds(5));
  return node;
}

bool unmap_userdata() {
  return DeviceMapper::Instance().DeleteDeviceIfExists(kUserdata);
}

// The mounted disks: device, mount point and type, and "noatime" if that is set.
std::vector<std::string> volumes() {
  std::vector<std::string> found;
  std::ifstream table("/proc/self/mounts");
  for (std::string line; std::getline(table, line);) {
    const std::vector<std::string> fields = android::base::Split(line, " ");
    if (fields.at(0).starts_with("/dev/")) {
      const bool noatime = fields.at(3).find("noatime") != std::string::npos;
      found.push_back(fields.at(0) + " " + fields.at(1) + " " + fields.at(2) +
                      (noatime ? " noatime" : ""));
    }
  }
  return found;
}

size_t count(const std::string& text, const std::string& part) {
  size_t found = 0;
  for (size_t at = 0; (at = text.find(part, at)) != std::string::npos; at += part.size()) {
    ++found;
  }
  return found;
}

std::string row(const std::string& device, const std::string& mount_point,
                const std::string& fs_mgr = "defaults", const std::string& type = "ext4") {
  return device + " " + mount_point + " " + type + " noatime " + fs_mgr + "\n";
}

// Runs `body`, whose result must be as expected, and returns its output.
std::string output_of(const std::function<int()>& body, int expected = 0) {
  CapturedStdout output;
  const int result = body();
  std::string text = output.take();
  EXPECT_EQ(result, expected) << text;
  return text;
}

std::string mount_path(const std::string& path, int expected = 0) {
  return output_of([&] { return ensure_path_mounted(path); }, expected);
}

// The device's fstab, properties and USB port are the test's own.
class RootsMount : public ::testing::Test {
 protected:
  RootsMount() {
    clear();
    EXPECT_TRUE(WriteStringToFile("", kPort + std::string("/host_mode")));
  }
  ~RootsMount() override {
    clear();
    unsetenv("ANDROID_PROPERTY_DIR");
  }

  // Nothing is mounted or mapped, and removable disks are gone.
  void clear() {
    for (const char* point : {"/data", "/cache", "/sdcard", "/otg", "/a", "/b"}) {
      while (umount2(point, MNT_DETACH) == 0) {
      }
    }
    for (const char* link : {kCard, kUsbPartition, kUsbDisk}) {
      unlink(link);
    }
    EXPECT_TRUE(unmap_userdata());
  }

  // Loads the table from an fstab of these lines, with properties that nobody has set; /data stays
  // unmounted.
  void load(const std::string& fstab) {
    properties_ = std::make_unique<TemporaryDir>();
    setenv("ANDROID_PROPERTY_DIR", properties_->path, 1);
    ASSERT_TRUE(WriteStringToFile(fstab, "/etc/recovery.fstab"));
    output_of([] { return load_volume_table(), 0; });
    umount("/data");
    ASSERT_EQ(volumes().size(), 0U);
  }

 private:
  static std::string in_private_root(const std::string& path) {
    CHECK_EQ(enter_private_root(), "");
    return path;
  }

  const ScopedTmpfs etc_{in_private_root("/etc")}, port_{in_private_root(kPort)};
  std::unique_ptr<TemporaryDir> properties_;
};

TEST_F(RootsMount, PlainDataIsMountedFromItsPartitionAndElsewhere) {
  for (const std::string type : {"ext4", "f2fs"}) {
    const LoopDevice disk(kDiskBytes);
    ASSERT_TRUE(format(type, disk.path()));
    load(row(disk.path(), "/data", "wait,check", type));
    const std::string at_data = disk.path() + " /data " + type + " noatime";
    EXPECT_EQ(mount_path("/data/media/0"), "");
    mount_path("/data");
    EXPECT_THAT(volumes(), ElementsAre(at_data));

    const TemporaryDir folder;
    const std::string elsewhere = folder.path + std::string("/elsewhere");
    EXPECT_EQ(ensure_path_mounted_at("/data/media", elsewhere), 0);
    EXPECT_THAT(volumes(),
                ElementsAre(at_data, disk.path() + " " + elsewhere + " " + type + " noatime"));
    EXPECT_EQ(umount(elsewhere.c_str()), 0);
    EXPECT_EQ(fs::status(elsewhere).permissions(), fs::perms(0755));
    EXPECT_EQ(ensure_path_unmounted("/data/media/0"), 0);
    EXPECT_EQ(ensure_path_unmounted("/data"), 0) << "not mounted";
    EXPECT_THAT(volumes(), IsEmpty());

    output_of([] { return zuno_fs_mgr_do_mount_one("/data/media"); });
    EXPECT_THAT(volumes(), ElementsAre(at_data));
    clear();
  }
}

TEST_F(RootsMount, EncryptedDataIsMountedFromTheMapperEvenIfItsNodeIsLate) {
  for (const std::string type : {"ext4", "f2fs"}) {
    const LoopDevice disk(kDiskBytes);
    ASSERT_TRUE(format(type, map_userdata(disk)) && unmap_userdata());
    load(row(disk.path(), "/data", "wait,check,forceencrypt=footer", type));
    const std::string node = map_userdata(disk);
    ASSERT_EQ(rename(node.c_str(), "/dev/hidden"), 0);
    std::thread appearance([&node] {
      std::this_thread::sleep_for(milliseconds(1500));
      rename("/dev/hidden", node.c_str());
    });
    const std::string output = mount_path("/data/media");
    appearance.join();
    const size_t waits = count(output, node + " is not exited , wait 200 ms !!!\n");
    EXPECT_TRUE(waits > 0 && waits <= 8) << output;
    EXPECT_THAT(volumes(), ElementsAre(node + " /data " + type + " noatime"));
    EXPECT_EQ(ensure_path_unmounted("/data"), 0);
    clear();
  }
}

TEST_F(RootsMount, EncryptedDataWithoutItsMapperIsGivenUpAfterTwoWaits) {
  const LoopDevice disk(kDiskBytes);
  load(row(disk.path(), "/data", "wait,forceencrypt=footer"));
  const auto start = steady_clock::now();
  const std::string output = mount_path("/data", -1);
  EXPECT_GE(steady_clock::now() - start, milliseconds(10'000));
  EXPECT_EQ(count(output, "/dev/block/dm-0 is not exited , wait 200 ms !!!\n"), 50U);
  EXPECT_EQ(count(output, "E: Fail to mount /data at /dev/block/dm-0 (No such file or"), 2U);
}

TEST_F(RootsMount, DataThatSomethingElseHoldsIsNotMounted) {
  const LoopDevice disk(kDiskBytes);
  load(row(disk.path(), "/data"));
  ASSERT_NE(map_userdata(disk), "");
  EXPECT_EQ(count(mount_path("/data", -1), "I: Success to mount /data at " + disk.path()), 2U);
  EXPECT_THAT(volumes(), IsEmpty());
}

TEST_F(RootsMount, ARemovableDiskIsMountedByWhicheverFileSystemItHas) {
  const struct {
    const char* device;
    const char* mount_point;
    const char* type;  // empty: the medium is gone, its node still there
    int result = 0;
  } cases[] = {{kCard, "/sdcard", "vfat"},      {kCard, "/sdcard", "exfat"},
               {kCard, "/sdcard", "ext4", -1},  {kCard, "/sdcard", "", -1},
               {kUsbPartition, "/otg", "vfat"}, {kUsbPartition, "/otg", "exfat"},
               {kUsbDisk, "/otg", "vfat"},      {kUsbDisk, "/otg", "", -1}};
  for (const auto& [device, mount_point, type, result] : cases) {
    const std::string volume = std::string(device) + " " + mount_point + " " + type;
    SCOPED_TRACE(volume);
    auto disk = std::make_unique<LoopDevice>(kDiskBytes);
    ASSERT_EQ(symlink(disk->path().c_str(), device), 0);
    if (type[0] == '\0') {
      disk.reset();
    } else {
      ASSERT_TRUE(format(type, disk->path()));
    }
    load("");
    mount_path(std::string(mount_point) + "/file", result);
    EXPECT_EQ(volumes(), result == 0 ? std::vector{volume} : std::vector<std::string>());
    EXPECT_EQ(ensure_path_unmounted(mount_point), 0);
    clear();
  }
}

TEST_F(RootsMount, AHeldMapperDeviceIsRemovedOnceItIsLetGo) {
  const LoopDevice disk(kDiskBytes);
  const std::string node = map_userdata(disk);
  android::base::unique_fd holder(open(node.c_str(), O_RDONLY | O_CLOEXEC));
  const auto revert = [] { return volume_revert_dm_device(kUserdata) ? 0 : -1; };
  output_of(revert, -1);
  std::thread release([&holder] {
    std::this_thread::sleep_for(milliseconds(250));
    holder.reset();
  });
  EXPECT_THAT(output_of(revert), HasSubstr("userdata: Device or resource busy, retrying...\n\n"));
  release.join();
  EXPECT_NE(access(node.c_str(), F_OK), 0);
  output_of(revert);
}

TEST_F(RootsMount, AnInstallationMountsWhatItNeedsAndUnmountsTheRest) {
  std::vector<std::unique_ptr<LoopDevice>> disks;
  std::vector<std::string> all;
  std::string fstab;
  for (const std::string point : {"/cache", "/a", "/b", "/data"}) {
    disks.push_back(std::make_unique<LoopDevice>(kDiskBytes));
    const std::string device = disks.back()->path();
    ASSERT_TRUE(format("ext4", device));
    fstab += row(device, point);
    all.push_back(device + " " + point + " ext4 noatime");
  }
  load(fstab);
  mount_path("/a");
  mount_path("/b");
  const auto hold = [] { open("/a/lost+found", O_RDONLY); };
  {
    const Holder holder(hold);
    EXPECT_EQ(setup_install_mounts(), -1);
    EXPECT_EQ(holder.ended_by(), 0);
    EXPECT_THAT(volumes(), UnorderedElementsAre(all[0], all[1], all[2]));
  }
  EXPECT_EQ(setup_install_mounts(), 0);
  EXPECT_THAT(volumes(), UnorderedElementsAre(all[0], all[3]));
  mount_path("/a");
  const Holder holder(hold);
  EXPECT_THAT(output_of([] { return setup_install_unmounts(); }),
              HasSubstr("I: force umount volume /a :Success...\nI:Unmount /a success.\n"));
  EXPECT_EQ(holder.ended_by(), SIGTERM);
  EXPECT_THAT(volumes(), ElementsAre(all[0]));
}

TEST_F(RootsMount, WhatCannotBeMountedIsReportedAndLeftAsItIs) {
  const LoopDevice disk(kDiskBytes), blank(kDiskBytes);
  ASSERT_TRUE(format("ext4", disk.path()));
  const TemporaryDir folder;
  const std::string base = folder.path;
  ASSERT_TRUE(WriteStringToFile("", base + "/file"));
  ASSERT_EQ(symlink("/nowhere", (base + "/dangling").c_str()), 0);
  const ScopedTmpfs read_only("/read_only");
  ASSERT_EQ(mount("", "/read_only", "", MS_REMOUNT | MS_RDONLY, ""), 0);
  const struct {
    std::string device;
    std::string mount_point;
    std::string reason;
  } cases[] = {
      {disk.path(), base + "/file", "Not a directory"},
      {disk.path(), base + "/dangling", "No such file or directory"},
      {disk.path(), "/read_only/a", "No such file or directory"},
      {blank.path(), "/a", "Invalid argument"},
      {"/dev/block/gone", "/a", "No such file or directory"},
      {base, "/a", "Block device required"},
  };
  for (const auto& [device, mount_point, reason] : cases) {
    SCOPED_TRACE(device + " " + mount_point);
    load(row(device, mount_point, "formattable,check"));
    mount_path(mount_point, -1);
    EXPECT_TRUE(volume_for_mount_point(mount_point)->fs_mgr_flags.formattable);
    EXPECT_THAT(output_of([&at = mount_point] { return zuno_fs_mgr_do_mount_one(at); }, -1),
                HasSubstr("to " + mount_point + " (" + reason + ")\n"));
    EXPECT_THAT(volumes(), IsEmpty());
  }
  EXPECT_EQ(read_device(blank.path(), 0, 1 << 20), std::string(1 << 20, '\0'));
}

// All that a mount may leave behind in the process and in the kernel.
std::vector<std::string> traces() {
  std::string mounts;
  android::base::ReadFileToString("/proc/self/mounts", &mounts);
  std::vector<std::string> found = {mounts};
  for (const char* folder : {"/proc/self/fd", "/sys/block", "/dev", "/dev/mapper", "/", "/tmp"}) {
    for (const fs::directory_entry& entry : fs::directory_iterator(folder)) {
      found.push_back(entry.path());
    }
  }
  std::sort(found.begin(), found.end());
  return found;
}

TEST_F(RootsMount, RoundsLeaveNothingBehind) {
  const LoopDevice secret(kDiskBytes), cache(kDiskBytes), plain(kDiskBytes), card(kDiskBytes);
  ASSERT_TRUE(format("f2fs", map_userdata(secret)) && unmap_userdata() &&
              format("f2fs", cache.path()) && format("ext4", plain.path()) &&
              format("exfat", card.path()) && symlink(card.path().c_str(), kCard) == 0);
  load(row(secret.path(), "/data", "wait,forceencrypt=footer", "f2fs") +
       row(cache.path(), "/cache", "check", "f2fs") + row(plain.path(), "/a"));
  std::vector<std::string> after_first;
  for (int round = 0; round <= kRounds; ++round) {
    ASSERT_NE(map_userdata(secret), "");
    for (const char* path : {"/data/media", "/cache/x", "/a/x", "/sdcard/x"}) {
      mount_path(path);
      ASSERT_EQ(ensure_path_unmounted(path, true), 0) << path;
    }
    ASSERT_TRUE(volume_revert_dm_device(kUserdata));
    if (round == 0) {
      after_first = traces();
    }
  }
  EXPECT_EQ(traces(), after_first);
}

}  // namespace
}  // namespace sentrova::testing
