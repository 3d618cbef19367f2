#include "otautil/sysutil.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/properties.h>
#include <gmock/gmock.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "tests/support/descriptors.h"

namespace {

using android::base::SetProperty;
using android::base::WriteStringToFile;
using sentrova::testing::count_descriptors;
using ::testing::EndsWith;
using ::testing::StartsWith;

using Cases = std::vector<std::pair<std::string, std::string>>;

constexpr size_t kBlock = 4096;
constexpr size_t kDeviceBlocks = 16;

// A file in the place of a block device, each block of which is filled with a letter of its own
// and ends within a page, and a block map for it.
class BlockMaps : public ::testing::Test {
 protected:
  void SetUp() override {
    // The machine's page has the size of the blocks, on the device as well.
    ASSERT_EQ(sysconf(_SC_PAGESIZE), static_cast<long>(kBlock));
    for (size_t i = 0; i < kDeviceBlocks; ++i) {
      content_ += std::string(kBlock, static_cast<char>('a' + i));
    }
    content_.resize(content_.size() - 10);
    ASSERT_TRUE(WriteStringToFile(content_, device_.path));
    android::base::SetLogger([this](auto, auto, auto, auto, auto, const char* text) {
      log_ += text + std::string("\n");
    });
  }
  void TearDown() override { android::base::SetLogger(android::base::StderrLogger); }

  // Maps what a map of these lines, from the second on behind the device's path, describes.
  bool map(const std::string& rest) { return map_text(device_.path + ("\n" + rest)); }
  bool map_text(const std::string& text) {
    log_.clear();
    EXPECT_TRUE(WriteStringToFile(text, map_file_.path));
    return mapping_.MapFile(std::string("@") + map_file_.path);
  }
  std::string mapped() const {
    return std::string(reinterpret_cast<const char*>(mapping_.addr), mapping_.length);
  }

  // How often the device is mapped in this process.
  size_t device_mappings() const {
    std::string maps;
    EXPECT_TRUE(android::base::ReadFileToString("/proc/self/maps", &maps));
    size_t count = 0;
    for (size_t at = 0; (at = maps.find(device_.path, at)) != std::string::npos; ++at) {
      ++count;
    }
    return count;
  }

  TemporaryFile device_, map_file_;
  std::string content_, log_;
  MemMapping mapping_;
};

TEST_F(BlockMaps, AreMappedInTheirOrder) {
  const auto blocks = [this](size_t first, size_t end) {
    return content_.substr(first * kBlock, (end - first) * kBlock);
  };
  const Cases cases = {
      {"12188 4096\n2\n10 12\n3 4", (blocks(10, 12) + blocks(3, 4)).substr(0, 12188)},
      {"4097 4096\n1\n7 9\n\n \t\n", blocks(7, 9).substr(0, 4097)},
      {" 8192\t4096 rest\n+2 of them\n3 4 x\n3 4 x", blocks(3, 4) + blocks(3, 4)},
      {"8192 8192\n1\n7 8", content_.substr(14 * kBlock) + std::string(10, '\0')},
      {"4086 12288\n1\n5 6", content_.substr(15 * kBlock)},  // the device ends pages before it
      {"1024 1024\n1\n8 9", blocks(2, 3).substr(0, 1024)},
  };
  for (const auto& [rest, expected] : cases) {
    ASSERT_TRUE(map(rest)) << rest << log_;
    EXPECT_EQ(mapped(), expected) << rest;
    EXPECT_EQ(log_, "mmapped " + std::to_string(mapping_.ranges()) + " ranges\n");
  }
  const BlockMapData data = BlockMapData::ParseBlockMapFile(map_file_.path);
  EXPECT_EQ(data.device_path, device_.path);
  EXPECT_EQ(data.file_size, 1024u);
  EXPECT_EQ(data.block_size, 1024u);
  EXPECT_EQ(data.block_ranges, RangeSet({{8, 9}}));
}

TEST_F(BlockMaps, WithADefectAreRefusedByName) {
  const std::string invalid_data = "Invalid data in block map file: size ";
  const Cases cases = {
      {"8192 4096\n1", "Block map file is too short: 3"},
      {"8192\n1\n0 2", "Failed to parse file size and block size: 8192"},
      {"0 4096\n1\n0 2", "Invalid size in block map file: size 0, blksize 4096"},
      {"8192 0\n1\n0 2", "Invalid size in block map file: size 8192, blksize 0"},
      {"8192 4096\nx\n0 2", "Failed to parse block map header: x"},
      {"8192 4096\n0\n0 2", invalid_data + "8192, blksize 4096, range_count 0, lines 4"},
      {"8192 4096\n2\n0 2", invalid_data + "8192, blksize 4096, range_count 2, lines 4"},
      {"8192 4096\n1\n0 1\n1 2", invalid_data + "8192, blksize 4096, range_count 1, lines 5"},
      {"4294967296 1\n1\n0 4294967296",
       invalid_data + "4294967296, blksize 1, range_count 1, lines 4"},
      {"8192 4096\n2\n0 1\n2", "failed to parse range 1: 2"},
      {"8192 4096\n1\n2 2", "Invalid range: 2 2"},
      {"8192 4096\n1\n0 3", "Invalid range: 0 3"},
      {"8192 4096\n1\n0 -1", "Invalid range: 0 18446744073709551615"},
      {"8192 4096\n1\n0 1", "Invalid ranges: remaining blocks 1"},
  };
  for (const auto& [rest, message] : cases) {
    ASSERT_TRUE(map("4096 4096\n1\n0 1"));
    EXPECT_FALSE(map(rest)) << rest;
    EXPECT_EQ(log_, message + "\nMap of '@" + map_file_.path + "' failed\n");
    EXPECT_EQ(mapping_.addr, nullptr);
    EXPECT_EQ(device_mappings(), 0u) << "what was mapped before is let go";
  }
}

TEST_F(BlockMaps, ThatTheDeviceCannotServeLeaveNothingBehind) {
  const auto descriptors = count_descriptors();
  const Cases cases = {
      // Past the device's end; a block of it alone would be mapped and raise SIGBUS when read.
      {"8192 4096\n2\n0 1\n16 17", "failed to map range 16: 17: No such device or address"},
      {"4097 12288\n1\n5 6", "failed to map range 5: 6: No such device or address"},
      {"8192 4096\n1\n15 17", "failed to map range 15: 17: No such device or address"},
      {"4096 4096\n1\n2251799813685247 2251799813685248",
       "failed to map range 2251799813685247: 2251799813685248: Value too large"},
      {"4096 4096\n1\n4503599627370496 4503599627370497",  // its offset in 64 bits is 0
       "failed to map range 4503599627370496: 4503599627370497: Value too large"},
      // The second is not at a page.
      {"2048 1024\n2\n0 1\n4 5", "failed to map range 4: 5: Invalid argument"},
      {"18446744060824649730 4294967295\n1\n0 4294967294", "failed to reserve address space: "},
  };
  for (const auto& [rest, message] : cases) {
    EXPECT_FALSE(map(rest)) << rest;
    EXPECT_THAT(log_, StartsWith(message));
    EXPECT_EQ(device_mappings() + mapping_.ranges(), 0u) << rest;
  }
  EXPECT_FALSE(map_text("/nonexistent/device\n4096 4096\n1\n0 1"));
  EXPECT_THAT(log_, StartsWith("failed to open block device /nonexistent/device: No such file"));
  for (const std::string no_device : {"/dev/zero", "/proc"}) {
    EXPECT_FALSE(map_text(no_device + "\n4096 4096\n1\n0 1")) << no_device;
  }
  EXPECT_EQ(count_descriptors(), descriptors);
}

TEST_F(BlockMaps, PlainFilesAreMappedWholeOrNamed) {
  ASSERT_TRUE(mapping_.MapFile(device_.path)) << log_;
  EXPECT_EQ(mapped(), content_);
  EXPECT_EQ(mapping_.mapped_ranges.at(0).length, content_.size());
  ASSERT_TRUE(mapping_.MapFD(device_.fd));
  EXPECT_EQ(device_mappings(), 1u);
  {
    const MemMapping moved = std::move(mapping_);
    EXPECT_EQ(mapping_.addr, nullptr);  // NOLINT(bugprone-use-after-move): is emptied by it
    EXPECT_EQ(moved.length, content_.size());
  }
  EXPECT_EQ(device_mappings(), 0u);

  const TemporaryFile empty;
  const TemporaryDir folder;
  const std::string fifo = folder.path + std::string("/fifo");
  ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
  const Cases cases = {
      {"", "Empty filename\n"},
      {"@", "Failed to read : No such file or directory\nMap of '@' failed\n"},
      {"@/dev/zero", "Failed to read /dev/zero: File too large\nMap of '@/dev/zero' failed\n"},
      {"/nonexistent", "Unable to open '/nonexistent': No such file or directory\n"},
      {empty.path,
       ", 0) failed: Invalid argument\nMap of '" + std::string(empty.path) + "' failed\n"},
      {fifo, "Map of '" + fifo + "' failed\n"},
  };
  for (const auto& [name, last_message] : cases) {
    EXPECT_FALSE(mapping_.MapFile(name)) << name;
    EXPECT_THAT(log_, EndsWith(last_message));
  }
  EXPECT_FALSE(mapping_.MapFD(-1));
  EXPECT_THAT(log_, EndsWith("fstat(-1) failed: Bad file descriptor\n"));
}

// A property store of the test's own.
class PowerRequests : public ::testing::Test {
 protected:
  PowerRequests() { setenv("ANDROID_PROPERTY_DIR", properties_.path, 1); }
  ~PowerRequests() override { unsetenv("ANDROID_PROPERTY_DIR"); }

  static std::string requested() { return android::base::GetProperty("sys.powerctl", "none"); }

 private:
  const TemporaryDir properties_;
};

// sys.powerctl takes a value of at most 91 bytes.
const std::string kTooLong(91, 'x');

TEST_F(PowerRequests, RebootAsksOnceAndNeverReturns) {
  const std::tuple<const char*, const char*, const char*> cases[] = {
      {"recovery", "", "reboot,recovery"},
      {"bootloader2", "1", "reboot,bootloader2,quiescent"},
      {"", "true", "reboot,,quiescent"},
      {"bootloader", "1", "reboot,bootloader"},
      {"fastboot", "1", "reboot,fastboot"}};
  for (const auto& [reason, quiescent, expected] : cases) {
    const TemporaryDir properties;
    setenv("ANDROID_PROPERTY_DIR", properties.path, 1);
    ASSERT_TRUE(SetProperty("ro.boot.quiescent", quiescent));
    const pid_t child = fork();
    if (child == 0) {
      signal(SIGUSR1, [](int) {});
      Reboot(reason);
    }
    for (int looks = 0; looks < 1000 && requested() == "none"; ++looks) {
      usleep(5'000);
    }
    EXPECT_EQ(requested(), expected);
    kill(child, SIGUSR1);
    usleep(20'000);
    EXPECT_EQ(waitpid(child, nullptr, WNOHANG), 0) << "a signal made it go on";
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
  }
}

TEST_F(PowerRequests, ThatCannotBeMadeAreFatalForARebootAndToldOfAShutdown) {
  EXPECT_EXIT(Reboot(kTooLong), ::testing::KilledBySignal(SIGABRT), "Reboot failed");
  ASSERT_TRUE(SetProperty("ro.boot.quiescent", "1"));
  for (const std::string reason : {"", "thermal"}) {
    EXPECT_TRUE(Shutdown(reason));
    EXPECT_EQ(requested(), "shutdown," + reason);
  }
  EXPECT_FALSE(Shutdown(kTooLong));
  EXPECT_EQ(requested(), "shutdown,thermal");
}

TEST(StringVectorToNullTerminatedArray, PointsAtTheArgumentsAndEndsWithNull) {
  std::vector<std::string> arguments{"/system/bin/tool", ""};
  EXPECT_EQ(StringVectorToNullTerminatedArray(arguments),
            (std::vector<char*>{arguments[0].data(), arguments[1].data(), nullptr}));
}

}  // namespace
