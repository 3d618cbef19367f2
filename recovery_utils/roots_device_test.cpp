#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/properties.h>
#include <android-base/strings.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <libdm/dm.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <regex>
#include <string>
#include <vector>

#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "tests/support/captured_stdout.h"
#include "tests/support/loop_device.h"
#include "tests/support/private_mounts.h"

namespace sentrova::testing {
namespace {

namespace fs = std::filesystem;

using android::base::unique_fd;
using android::base::WriteStringToFile;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

using Texts = std::vector<std::string>;

constexpr int64_t kSize = 256 << 20;
constexpr int64_t kBlocks = kSize / 4096;
constexpr char kUserdata[] = "userdata";
constexpr char kCard[] = "/dev/block/mmcblk1p1";
constexpr char kUsbPartition[] = "/dev/block/sda1";
constexpr char kUsbDisk[] = "/dev/block/sda";

// The volumes of the device's own kernel and tools. Fstab and properties are the test's own;
// nothing is mounted from a disk or mapped as user data at first and at the end.
class Volumes : public ::testing::Test {
 protected:
  Volumes() { clear(); }
  ~Volumes() override {
    clear();
    unsetenv("ANDROID_PROPERTY_DIR");
  }

  static void clear() {
    for (const char* point : {"/data", "/cache", "/sdcard", "/otg"}) {
      while (umount2(point, MNT_DETACH) == 0) {
      }
    }
    EXPECT_TRUE(android::dm::DeviceMapper::Instance().DeleteDeviceIfExists(kUserdata));
  }

  // Loads the table from an fstab of these lines, with properties that nobody has set but these;
  // /data stays unmounted.
  void load(const std::string& fstab,
            const std::vector<std::pair<std::string, std::string>>& properties = {}) {
    properties_ = std::make_unique<TemporaryDir>();
    setenv("ANDROID_PROPERTY_DIR", properties_->path, 1);
    for (const auto& [name, value] : properties) {
      android::base::SetProperty(name, value);
    }
    ASSERT_TRUE(WriteStringToFile(fstab, "/etc/recovery.fstab"));
    output_of([] { return load_volume_table(), 0; });
    umount("/data");
  }

  // Puts a disk, from a block of it on, behind the encrypting device of user data; returns its
  // node, empty on failure.
  static std::string map_userdata(const LoopDevice& disk, uint64_t first_block = 0) {
    android::dm::DmTable table;
    table.Emplace<android::dm::DmTargetCrypt>(0U, 8 * (uint64_t{kBlocks} - first_block),
                                              "aes-xts-plain64", std::string(128, '5'), 0U,
                                              disk.path(), 8 * first_block);
    std::string node;
    android::dm::DeviceMapper::Instance().CreateDevice(kUserdata, table, &node,
                                                       std::chrono::seconds(5));
    return node;
  }

  // Runs `body`, whose result must be as expected, and returns its output.
  static std::string output_of(const std::function<int()>& body, int expected = 0) {
    CapturedStdout output;
    const int result = body();
    std::string text = output.take();
    EXPECT_EQ(result, expected) << text;
    return text;
  }
  static std::string mount_path(const std::string& path, int expected = 0) {
    return output_of([&] { return ensure_path_mounted(path); }, expected);
  }

  // The mounted disks: device, mount point and type, and "noatime" if that is set.
  static Texts mounted() {
    Texts found;
    std::ifstream table("/proc/self/mounts");
    for (std::string line; std::getline(table, line);) {
      const Texts fields = android::base::Split(line, " ");
      if (fields.at(0).starts_with("/dev/")) {
        const bool noatime = fields.at(3).find("noatime") != std::string::npos;
        found.push_back(fields.at(0) + " " + fields.at(1) + " " + fields.at(2) +
                        (noatime ? " noatime" : ""));
      }
    }
    return found;
  }

  static bool format(const std::string& type, const std::string& device) {
    const std::string tool = type == "f2fs" ? "make_f2fs" : "mkfs." + type;
    return type == "ext4" ? run_program({"/system/bin/mke2fs", "-q", "-F", "-t", type, device}) == 0
                          : run_program({"/system/bin/" + tool, device}) == 0;
  }

 private:
  static std::string in_private_root(const std::string& path) {
    CHECK_EQ(enter_private_root(), "");
    return path;
  }

  const ScopedTmpfs etc_{in_private_root("/etc")};
  std::unique_ptr<TemporaryDir> properties_;
};

TEST_F(Volumes, OfRemovableDisksAreMountedByWhicheverFileSystemTheyHave) {
  const ScopedTmpfs port("/sys/devices/platform/soc/a600000.ssusb");
  ASSERT_TRUE(WriteStringToFile("", "/sys/devices/platform/soc/a600000.ssusb/host_mode"));
  const struct {
    const char* device;
    const char* mount_point;
    std::string type;  // empty: the medium is gone, its node still there
    int result = 0;
  } cases[] = {{kCard, "/sdcard", "vfat"},       {kCard, "/sdcard", "exfat"},
               {kCard, "/sdcard", "ext4", -1},   {kUsbPartition, "/otg", "vfat"},
               {kUsbPartition, "/otg", "exfat"}, {kUsbDisk, "/otg", "", -1}};
  for (const auto& [device, mount_point, type, result] : cases) {
    const std::string volume = std::string(device) + " " + mount_point + " " + type;
    SCOPED_TRACE(volume);
    auto disk = std::make_unique<LoopDevice>(kSize);
    ASSERT_EQ(symlink(disk->path().c_str(), device), 0);
    if (type.empty()) {
      disk.reset();
    } else {
      ASSERT_TRUE(format(type, disk->path()));
    }
    load("");
    mount_path(std::string(mount_point) + "/file", result);
    EXPECT_EQ(mounted(), result == 0 ? Texts{volume} : Texts{});
    EXPECT_EQ(ensure_path_unmounted(mount_point), 0);
    unlink(device);
  }
}

// All that a mount may leave behind in the process and in the kernel.
Texts traces() {
  Texts found;
  android::base::ReadFileToString("/proc/self/mounts", &found.emplace_back());
  for (const char* folder : {"/proc/self/fd", "/sys/block", "/dev", "/dev/mapper", "/", "/tmp"}) {
    for (const fs::directory_entry& entry : fs::directory_iterator(folder)) {
      found.push_back(entry.path());
    }
  }
  std::sort(found.begin(), found.end());
  return found;
}

TEST_F(Volumes, OfEncryptedDataAreMountedFromTheMapperAndLeaveNothingBehind) {
  const LoopDevice secret(kSize);
  ASSERT_TRUE(format("f2fs", map_userdata(secret)) && volume_revert_dm_device(kUserdata));
  load(secret.path() + " /data f2fs noatime wait,forceencrypt=footer\n");
  Texts after_first;
  for (int round = 0; round <= 5; ++round) {
    const std::string node = map_userdata(secret);
    mount_path("/data/media");
    EXPECT_THAT(mounted(), ElementsAre(node + " /data f2fs noatime"));
    {
      const unique_fd file(open("/data/f", O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
      EXPECT_EQ(ensure_path_unmounted("/data"), -1);
      output_of([] { return volume_revert_dm_device(kUserdata) ? 0 : -1; }, -1);
    }
    EXPECT_EQ(ensure_path_unmounted("/data", true), 0);
    EXPECT_TRUE(volume_revert_dm_device(kUserdata));
    if (round == 0) {
      after_first = traces();
    }
  }
  EXPECT_EQ(traces(), after_first);
}

class FormattedVolumes : public Volumes {
 protected:
  void SetUp() override {
    fs::create_directories("/data");
    fs::create_directories("/cache");
  }

  // The checking tool finds nothing wrong, and what the tools tell of the file system has these.
  static void expect_sound(const std::string& device, const std::string& type, const Texts& facts) {
    CapturedStdout output;
    if (type == "ext4") {
      EXPECT_EQ(run_program({"/system/bin/e2fsck", "-fn", device}), 0);
      EXPECT_EQ(run_program({"/system/bin/tune2fs", "-l", device}), 0);
    } else {
      EXPECT_EQ(run_program({"/system/bin/fsck.f2fs", "--dry-run", device}), 0);
    }
    const std::string told = std::regex_replace(output.take(), std::regex("[ \t]+"), " ");
    for (const std::string& fact : facts) {
      EXPECT_THAT(told, HasSubstr(fact + "\n"));
    }
  }
  static std::string ext4_blocks(int64_t count) { return "Block count: " + std::to_string(count); }

  const LoopDevice disk_{kSize};
};

TEST_F(FormattedVolumes, OfEveryKindAreFilledOrEmpty) {
  const std::string disk = disk_.path();
  const struct {
    std::string mount_point;
    std::string type;
    const char* options;
    Texts facts;
  } cases[] = {
      {"/cache", "ext4", "defaults", {ext4_blocks(kBlocks), "Inode size: 256"}},
      {"/data",
       "ext4",
       "metadata_csum,length=-16384,logicalblk=4096,eraseblk=524288",
       {ext4_blocks(kBlocks - 4), "Inode size: 512", "RAID stride: 2", "RAID stripe width: 128",
        "Checksum type: crc32c"}},
      {"/data", "ext4", "length=134217728", {ext4_blocks(kBlocks / 2)}},
      {"/data",
       "f2fs",
       "fscompress,length=-4194304",
       {"total FS sectors = 516096 (252 MB)",
        "encrypt verity extra_attr project_quota quota_ino casefold compression"}},
      {"/data", "f2fs", "forceencrypt=footer", {"total FS sectors = 524256 (255 MB)"}},
  };
  const TemporaryDir sample;
  const std::string content(3 << 20, 'p');
  fs::create_directory(sample.path + std::string("/media"));
  ASSERT_TRUE(WriteStringToFile(content, sample.path + std::string("/media/photo"), 0640, 1023, 1));
  for (const auto& [mount_point, type, options, facts] : cases) {
    SCOPED_TRACE(type + " " + options);
    const auto mount_disk = [&, &at = mount_point, &kind = type] {
      EXPECT_EQ(mount(disk.c_str(), at.c_str(), kind.c_str(), 0, ""), 0) << strerror(errno);
    };
    ASSERT_TRUE(write_device(disk, 0, std::string(16384, 'x')));
    load(disk + " " + mount_point + " " + type + " noatime " + options + "\n",
         {{"external_storage.projid.enabled", "1"}, {"external_storage.casefold.enabled", "1"}});
    EXPECT_EQ(format_volume(mount_point, sample.path), 0);
    expect_sound(disk, type, facts);
    mount_disk();
    std::string found;
    struct stat status = {};
    EXPECT_TRUE(android::base::ReadFileToString(mount_point + "/media/photo", &found));
    EXPECT_TRUE(found == content) << found.size();
    EXPECT_EQ(stat((mount_point + "/media/photo").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0640U);
    EXPECT_EQ(format_volume(mount_point), 0) << "mounted as it is";
    expect_sound(disk, type, facts);
    mount_disk();
    EXPECT_FALSE(fs::exists(mount_point + "/media"));
    EXPECT_EQ(umount(mount_point.c_str()), 0);
  }
}

TEST_F(FormattedVolumes, LoseTheirKeyUnlessTheMappedDataAreFormattedInPlace) {
  const std::string mark(4096, 'k');
  const LoopDevice key(1 << 20);
  for (const bool in_place : {true, false}) {
    SCOPED_TRACE(in_place);
    clear();
    ASSERT_TRUE(write_device(key.path(), 0, mark) && write_device(disk_.path(), 0, mark));
    load(disk_.path() + " /data ext4 noatime forceencrypt=" + key.path() + "\n",
         {{"ro.crypto.state", "encrypted"}, {"ro.crypto.metadata.enabled", in_place ? "0" : "1"}});
    const std::string mapped = map_userdata(disk_, 1);
    bool revert_userdata = false;
    EXPECT_EQ(format_volume("/data", revert_userdata), 0);
    EXPECT_EQ(revert_userdata, !in_place);
    EXPECT_EQ(access(mapped.c_str(), F_OK), in_place ? 0 : -1);
    EXPECT_EQ(read_device(key.path(), 0, mark.size()),
              in_place ? mark : std::string(mark.size(), '\0'));
    EXPECT_EQ(read_device(disk_.path(), 0, mark.size()) == mark, in_place);
    expect_sound(in_place ? mapped : disk_.path(), "ext4",
                 {ext4_blocks(in_place ? kBlocks - 1 : kBlocks)});
  }
}

}  // namespace
}  // namespace sentrova::testing
