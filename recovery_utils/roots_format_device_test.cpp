#include <android-base/file.h>
#include <android-base/properties.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <libdm/dm.h>
#include <signal.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <filesystem>
#include <memory>
#include <regex>
#include <string>
#include <vector>

#include "datadump/datadump.h"
#include "recovery_utils/roots.h"
#include "tests/support/captured_stdout.h"
#include "tests/support/loop_device.h"
#include "tests/support/private_mounts.h"

namespace {

namespace fs = std::filesystem;

using android::base::ReadFileToString;
using android::base::SetProperty;
using android::base::unique_fd;
using android::base::WriteStringToFile;
using android::dm::DeviceMapper;
using android::dm::DmDeviceState;
using android::dm::DmTable;
using android::dm::DmTargetLinear;
using sentrova::testing::LoopDevice;
using sentrova::testing::read_device;
using sentrova::testing::run_program;
using sentrova::testing::ScopedTmpfs;
using sentrova::testing::write_device;
using ::testing::HasSubstr;

constexpr int64_t kSize = 256 << 20;
constexpr uint64_t kBlocks = kSize / 4096;
constexpr int64_t kSectorBytes = 512;

std::string ext4_blocks(uint64_t count) {
  return "Block count: " + std::to_string(count);
}

// The volume is a disk of the test's own, and so are fstab and properties. The reserved partition
// is the device's.
class FormatDevice : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    ASSERT_NE(disk_.path(), "");
    ASSERT_EQ(datadump_disable(), 0);
    fs::create_directories("/data");
    fs::create_directories("/cache");
    clear_properties();
  }
  void TearDown() override {
    for (const char* mount_point : {"/data", "/cache"}) {
      umount2(mount_point, MNT_DETACH);
    }
    DeviceMapper::Instance().DeleteDeviceIfExists("userdata");
    datadump_disable();
    unsetenv("ANDROID_PROPERTY_DIR");
  }

  void clear_properties() {
    properties_ = std::make_unique<TemporaryDir>();
    setenv("ANDROID_PROPERTY_DIR", properties_->path, 1);
  }
  static void encrypt(const char* type, const char* metadata) {
    SetProperty("ro.crypto.state", "encrypted");
    SetProperty("ro.crypto.type", type);
    SetProperty("ro.crypto.metadata.enabled", metadata);
  }

  // Makes this the only row of the fstab; loading mounts /data where it can be.
  static void load(const std::string& row) {
    const ScopedTmpfs etc("/etc");
    EXPECT_TRUE(WriteStringToFile(row + "\n", "/etc/recovery.fstab"));
    sentrova::testing::CapturedStdout output;
    load_volume_table();
  }

  // The checking tool finds nothing wrong, and what the tools tell of the file system has these.
  static void expect_sound(const std::string& device, const std::string& type,
                           const std::vector<std::string>& facts) {
    sentrova::testing::CapturedStdout output;
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

  bool map_userdata(int64_t offset_sectors) {
    DmTable table;
    table.Emplace<DmTargetLinear>(0U, static_cast<uint64_t>(kSize / kSectorBytes - offset_sectors),
                                  disk_.path(), static_cast<uint64_t>(offset_sectors));
    return DeviceMapper::Instance().CreateDevice("userdata", table, &mapped_,
                                                 std::chrono::seconds(5));
  }
  static bool is_mapped() {
    return DeviceMapper::Instance().GetState("userdata") != DmDeviceState::INVALID;
  }

  const LoopDevice disk_{kSize};
  std::string mapped_;

 private:
  std::unique_ptr<TemporaryDir> properties_;
};

constexpr char kSample[] = "/tmp/sample";
constexpr char kLabel[] = "trusted.label";

// A directory with a bit of everything that a file system keeps.
void make_sample() {
  fs::remove_all(kSample);
  fs::create_directories(std::string(kSample) + "/media/photos");
  const std::string file = std::string(kSample) + "/media/photos/first";
  ASSERT_TRUE(WriteStringToFile(std::string(3 << 20, 'p') + "end", file));
  ASSERT_EQ(chown(file.c_str(), 1023, 9997), 0);
  ASSERT_EQ(chmod(file.c_str(), 06640), 0);
  ASSERT_EQ(link(file.c_str(), (std::string(kSample) + "/second").c_str()), 0);
  ASSERT_EQ(symlink("media/photos/first", (std::string(kSample) + "/link").c_str()), 0);
  ASSERT_EQ(setxattr(file.c_str(), kLabel, "a\0b", 3, 0), 0);
  const timespec times[] = {{1'000'000'000, 1}, {1'111'111'111, 222'222'222}};
  ASSERT_EQ(utimensat(AT_FDCWD, file.c_str(), times, 0), 0);
  ASSERT_EQ(utimensat(AT_FDCWD, (std::string(kSample) + "/media").c_str(), times, 0), 0);
  ASSERT_EQ(chmod((std::string(kSample) + "/media").c_str(), 01771), 0);
}

// Whether the sample is all there, with what f2fs's tool does not take only where asked for.
void expect_sample(const std::string& root, bool all_attributes) {
  const std::string file = root + "/media/photos/first";
  std::string content;
  EXPECT_TRUE(ReadFileToString(file, &content));
  EXPECT_EQ(content == std::string(3 << 20, 'p') + "end", true) << content.size();
  std::string target;
  EXPECT_TRUE(android::base::Readlink(root + "/link", &target));
  EXPECT_EQ(target, "media/photos/first");
  struct stat status = {};
  ASSERT_EQ(stat(file.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 06640U);
  EXPECT_EQ(status.st_mtim.tv_sec, 1'111'111'111);
  struct stat folder = {};
  ASSERT_EQ(stat((root + "/media").c_str(), &folder), 0);
  EXPECT_EQ(folder.st_mode & 07777, 01771U);
  EXPECT_EQ(folder.st_mtim.tv_sec, 1'111'111'111);
  if (all_attributes) {
    EXPECT_EQ(status.st_uid, 1023U);
    EXPECT_EQ(status.st_gid, 9997U);
    EXPECT_EQ(status.st_mtim.tv_nsec, 222'222'222);
    char value[8];
    EXPECT_EQ(getxattr(file.c_str(), kLabel, value, sizeof(value)), 3);
    struct stat second = {};
    EXPECT_EQ(stat((root + "/second").c_str(), &second), 0);
    EXPECT_EQ(second.st_ino, status.st_ino);
  }
}

TEST_F(FormatDevice, MakesAndFillsEveryKindOfVolume) {
  const std::string disk = disk_.path();
  const std::string features = "encrypt verity extra_attr project_quota quota_ino";
  const struct {
    const char* mount_point;
    const char* type;
    const char* options;
    std::vector<std::string> facts;
  } cases[] = {
      {"/cache", "ext4", "defaults", {ext4_blocks(kBlocks), "Inode size: 256"}},
      {"/data",
       "ext4",
       "metadata_csum,length=-16384,logicalblk=4096,eraseblk=524288",
       {ext4_blocks(kBlocks - 4), "Inode size: 512", "RAID stride: 2", "RAID stripe width: 128",
        "Checksum type: crc32c"}},
      {"/data", "ext4", "forceencrypt=footer", {ext4_blocks(kBlocks - 4)}},
      {"/data", "ext4", "length=134217728", {ext4_blocks(kBlocks / 2)}},
      {"/cache", "f2fs", "defaults", {"total FS sectors = 524288 (256 MB)", features}},
      {"/data",
       "f2fs",
       "fscompress,length=-4194304",
       {"total FS sectors = 516096 (252 MB)", features + " casefold compression"}},
      {"/data", "f2fs", "forceencrypt=footer", {"total FS sectors = 524256 (255 MB)"}},
  };
  SetProperty("external_storage.projid.enabled", "1");
  SetProperty("external_storage.casefold.enabled", "1");
  for (const auto& [mount_point, type, options, facts] : cases) {
    SCOPED_TRACE(std::string(type) + " " + options);
    ASSERT_TRUE(write_device(disk, 0, std::string(16384, 'x')));
    load(disk + " " + mount_point + " " + type + " noatime " + options);
    make_sample();
    EXPECT_EQ(format_volume(mount_point, kSample), 0);
    expect_sound(disk, type, facts);
    ASSERT_EQ(mount(disk.c_str(), mount_point, type, 0, ""), 0) << strerror(errno);
    expect_sample(mount_point, type == std::string("ext4"));
    // Formats what is mounted now.
    EXPECT_EQ(format_volume(mount_point), 0);
    expect_sound(disk, type, facts);
    ASSERT_EQ(mount(disk.c_str(), mount_point, type, 0, ""), 0) << strerror(errno);
    EXPECT_FALSE(fs::exists(std::string(mount_point) + "/media"));
    EXPECT_EQ(umount(mount_point), 0);
  }
}

TEST_F(FormatDevice, FailsWithALengthThatTheDeviceHasNot) {
  const std::string row = disk_.path() + " /cache ext4 noatime length=";
  load(row + "1073741824");
  EXPECT_EQ(format_volume("/cache"), -1);
  const std::string mark(16384, 'x');
  ASSERT_TRUE(write_device(disk_.path(), 0, mark));
  for (const int64_t reserved : {kSize, kSize + 1}) {
    load(row + std::to_string(-reserved));
    EXPECT_EQ(format_volume("/cache"), -1);
    EXPECT_EQ(read_device(disk_.path(), 0, mark.size()), mark);
  }
}

TEST_F(FormatDevice, WipesTheKeyUnlessTheMappedDataAreFormattedInPlace) {
  constexpr int64_t kOffsetSectors = 8;
  const std::string mark(4096, 'k');
  const LoopDevice key(1 << 20);
  for (const bool in_place : {true, false}) {
    SCOPED_TRACE(in_place);
    clear_properties();
    encrypt("block", in_place ? "0" : "1");
    ASSERT_TRUE(write_device(key.path(), 0, mark) && write_device(disk_.path(), 0, mark));
    ASSERT_TRUE(is_mapped() || map_userdata(kOffsetSectors));
    load(disk_.path() + " /data ext4 noatime forceencrypt=" + key.path());
    bool revert_userdata = false;
    EXPECT_EQ(format_volume("/data", revert_userdata), 0);
    EXPECT_EQ(revert_userdata, !in_place);
    EXPECT_EQ(is_mapped(), in_place);
    EXPECT_EQ(read_device(key.path(), 0, mark.size()),
              in_place ? mark : std::string(mark.size(), '\0'));
    expect_sound(in_place ? mapped_ : disk_.path(), "ext4",
                 {ext4_blocks(in_place ? kBlocks - 1 : kBlocks)});
    if (in_place) {
      EXPECT_EQ(read_device(disk_.path(), 0, mark.size()), mark);
      EXPECT_EQ(mount(mapped_.c_str(), "/data", "ext4", 0, ""), 0);
    }
  }
}

TEST_F(FormatDevice, LeavesTheDumpItsAreaAndClearsItsOffset) {
  const LoopDevice large(int64_t{12} << 30);  // its file is sparse
  for (const std::string type : {"ext4", "f2fs"}) {
    SCOPED_TRACE(type);
    ASSERT_EQ(datadump_enable(), 0);
    ASSERT_EQ(datadump_resize(uint64_t{8} << 30), 0);
    load(large.path() + " /data " + type + " noatime length=33554432");
    EXPECT_EQ(format_volume("/data"), 0);
    EXPECT_EQ(datadump_get_status(), 1);
    expect_sound(large.path(), type,
                 {type == "ext4" ? ext4_blocks(2097152) : "total FS sectors = 16777216 (8192 MB)"});
  }
}

TEST_F(FormatDevice, TakesTheVolumeFromThoseWhoHoldIt) {
  load(disk_.path() + " /cache ext4 noatime defaults");
  ASSERT_EQ(format_volume("/cache"), 0);
  ASSERT_EQ(mount(disk_.path().c_str(), "/cache", "ext4", 0, ""), 0);
  const pid_t holder = fork();
  if (holder == 0) {
    const unique_fd held(open("/cache/held", O_RDWR | O_CREAT | O_CLOEXEC, 0600));
    while (true) {
      pause();
    }
  }
  while (!fs::exists("/cache/held")) {
    usleep(1000);
  }
  EXPECT_EQ(format_volume("/cache"), 0);
  int status = 0;
  EXPECT_EQ(waitpid(holder, &status, 0), holder);
  EXPECT_TRUE(WIFSIGNALED(status));
  expect_sound(disk_.path(), "ext4", {ext4_blocks(kBlocks)});
}

}  // namespace
