#include "datadump/datadump.h"

#include <android-base/file.h>
#include <android-base/stringprintf.h>
#include <android/log.h>
#include <errno.h>
#include <gmock/gmock.h>
#include <stdarg.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "tests/support/loop_device.h"
#include "tests/support/private_mounts.h"

namespace {

using android::base::ReadFileToString;
using android::base::WriteStringToFile;
using namespace std::string_literals;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kPartition[] = "/dev/block/by-name/reserved";
constexpr size_t kRecordOffset = 300;
constexpr size_t kRecordBytes = 16;
const std::string kMagics = "\xE2\x15\xE2\0\x6B\x6B\x6B\0"s;

std::vector<std::string> log_lines;

std::string failure(const std::string& what, const std::string& reason) {
  return what + " " + kPartition + " fail:" + reason + ".\n";
}

}  // namespace

// Stands in front of the system log for the whole test program.
extern "C" int __android_log_print(int priority, const char* tag, const char* format, ...) {
  EXPECT_EQ(priority, ANDROID_LOG_ERROR);
  EXPECT_EQ(tag, nullptr);
  va_list arguments;
  va_start(arguments, format);
  log_lines.emplace_back();
  android::base::StringAppendV(&log_lines.back(), format, arguments);
  va_end(arguments);
  return 1;
}

namespace {

// The reserved partition is the test's own: a file unless the test asks for a block device.
class DataDump : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    device_ = std::make_unique<sentrova::testing::LoopDevice>(4096);
    struct stat status = {};
    stat(device_->path().c_str(), &status);
    device_number_ = status.st_rdev;
    dev_ = std::make_unique<sentrova::testing::ScopedTmpfs>("/dev");
    std::filesystem::create_directories("/dev/block/by-name");
    log_lines.clear();
  }

  // False where the machine gives no block device.
  bool make_block_device() const {
    return device_number_ != 0 && mknod(kPartition, S_IFBLK | 0600, device_number_) == 0;
  }
  static void set_record(const std::string& record) {
    ASSERT_TRUE(WriteStringToFile(std::string(kRecordOffset, 'p') + record, kPartition));
  }
  static std::string partition() {
    std::string bytes;
    EXPECT_TRUE(ReadFileToString(kPartition, &bytes));
    return bytes;
  }
  static std::string record() { return partition().substr(kRecordOffset, kRecordBytes); }

 private:
  std::unique_ptr<sentrova::testing::LoopDevice> device_;
  dev_t device_number_ = 0;
  std::unique_ptr<sentrova::testing::ScopedTmpfs> dev_;
};

TEST_F(DataDump, ArmsMovesAndDisarmsWithoutTouchingTheRestOfThePartition) {
  if (!make_block_device()) {
    GTEST_SKIP() << "no block device here";
  }
  const std::string blank(4096, 'p');
  ASSERT_TRUE(WriteStringToFile(blank, kPartition));
  const struct {
    std::function<int()> call;
    std::string record;
    int status;
  } steps[] = {
      {datadump_enable, kMagics + "\0\0\0\0\0\0\0\0"s, 1},
      {[] { return datadump_resize(4096); }, kMagics + "\0\x10\0\0\0\0\0\0"s, 2},
      {[] { return datadump_resize(0x8877665544332211); },
       kMagics + "\x11\x22\x33\x44\x55\x66\x77\x88", 2},
      {[] { return datadump_resize(0); }, kMagics + "\0\0\0\0\0\0\0\0"s, 1},
      {[] { return datadump_resize(uint64_t{1} << 32); }, kMagics + "\0\0\0\0\1\0\0\0"s, 2},
      {datadump_enable, kMagics + "\0\0\0\0\0\0\0\0"s, 1},
      {datadump_disable, std::string(16, '\0'), 0},
  };
  for (const auto& [call, expected, status] : steps) {
    SCOPED_TRACE(::testing::PrintToString(expected));
    EXPECT_EQ(call(), 0);
    EXPECT_EQ(partition(), std::string(blank).replace(kRecordOffset, kRecordBytes, expected));
    EXPECT_EQ(datadump_get_status(), status);
  }
  EXPECT_THAT(log_lines, IsEmpty());
}

TEST_F(DataDump, IsArmedOnlyByBothMagics) {
  const std::string offset = "\1\0\0\0\0\0\0\0"s;
  const struct {
    std::string record;
    int status;
  } cases[] = {
      {kMagics + offset, 2},
      {std::string(16, '\0'), 0},
      {kMagics.substr(0, 4) + "\0\0\0\0"s + offset, 0},
      {"\0\0\0\0"s + kMagics.substr(4) + offset, 0},
      {"\0\xE2\x15\xE2\0\x6B\x6B\x6B"s + offset, 0},  // the other byte order
      {kMagics.substr(0, 7) + "\1" + offset, 0},
  };
  for (const auto& [bytes, status] : cases) {
    SCOPED_TRACE(::testing::PrintToString(bytes));
    set_record(bytes);
    EXPECT_EQ(datadump_get_status(), status);
    EXPECT_EQ(datadump_resize(5), status == 0 ? -1 : 0);
    EXPECT_EQ(record(), status == 0 ? bytes : kMagics + "\5\0\0\0\0\0\0\0"s);
  }
  EXPECT_THAT(log_lines, IsEmpty());
}

TEST_F(DataDump, HandsOutTheRecordWhateverItHolds) {
  uint32_t first = 1, second = 2;
  uint64_t offset = 3;
  EXPECT_EQ(datadump_query_flags(&first, &second, &offset), -1);
  EXPECT_THAT((std::vector<uint64_t>{first, second, offset}), ElementsAre(1, 2, 3));
  set_record("\1\2\3\4\5\6\7\x08\x09\x0A\x0B\x0C\x0D\x0E\x0F\xF0");
  EXPECT_EQ(datadump_query_flags(&first, &second, &offset), 0);
  EXPECT_EQ(first, 0x04030201U);
  EXPECT_EQ(second, 0x08070605U);
  EXPECT_EQ(offset, 0xF00F0E0D0C0B0A09U);
}

TEST_F(DataDump, SaysWhatThePartitionRefuses) {
  const std::function<int()> calls[] = {datadump_enable, datadump_disable,
                                        [] { return datadump_resize(0); }};
  const auto expect_failures = [&](const std::string& message) {
    for (const auto& call : calls) {
      log_lines.clear();
      EXPECT_EQ(call(), -1);
      EXPECT_THAT(log_lines, ElementsAre(message));
    }
  };
  std::filesystem::remove("/dev/block/by-name");
  expect_failures(failure("Open", "No such file or directory"));
  EXPECT_EQ(datadump_get_status(), -1);

  std::filesystem::create_directory("/dev/block/by-name");
  set_record(kMagics + std::string(7, '\0'));
  log_lines.clear();
  errno = 0;
  EXPECT_EQ(datadump_enable(), -1);
  EXPECT_THAT(log_lines, ElementsAre(failure("read", "Success")));

  set_record(kMagics + std::string(8, '\1'));
  const std::string before = partition();
  ASSERT_EQ(mount(nullptr, "/dev", nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
  expect_failures(failure("Open", "Read-only file system"));
  EXPECT_EQ(datadump_get_status(), 2);
  EXPECT_EQ(partition(), before);
}

// What a stream's buffer would take and its close would lose.
TEST_F(DataDump, CountsOnlyWhatReachedThePartition) {
  if (mknod(kPartition, S_IFCHR | 0600, makedev(1, 7)) != 0) {
    GTEST_SKIP() << "no device files here";
  }
  EXPECT_EQ(datadump_disable(), -1);
  EXPECT_THAT(log_lines, ElementsAre(failure("write", "No space left on device")));
}

}  // namespace
