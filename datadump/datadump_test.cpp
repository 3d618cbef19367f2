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

#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <tuple>
#include <vector>

#include "tests/support/loop_device.h"
#include "tests/support/private_mounts.h"

using namespace std::string_literals;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

std::vector<std::string> log_lines;

// Stands in front of the system log for the whole test program.
extern "C" int __android_log_print(int priority, const char* tag, const char* format, ...) {
  EXPECT_TRUE(priority == ANDROID_LOG_ERROR && tag == nullptr);
  va_list arguments;
  va_start(arguments, format);
  log_lines.emplace_back();
  android::base::StringAppendV(&log_lines.back(), format, arguments);
  va_end(arguments);
  return 1;
}

namespace {

constexpr char kPartition[] = "/dev/block/by-name/reserved";
constexpr size_t kRecordOffset = 300;
const std::string kMagics = "\xE2\x15\xE2\0\x6B\x6B\x6B\0"s;

std::string failure(const std::string& what, const std::string& reason) {
  return what + " " + kPartition + " fail:" + reason + ".\n";
}

// The reserved partition is the test's own: a file unless the test makes it a device.
class DataDump : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    device_ = std::make_unique<sentrova::testing::LoopDevice>(4096);
    stat(device_->path().c_str(), &device_status_);
    dev_ = std::make_unique<sentrova::testing::ScopedTmpfs>("/dev");
    std::filesystem::create_directories("/dev/block/by-name");
    log_lines.clear();
  }

  static void set_partition(const std::string& bytes) {
    ASSERT_TRUE(android::base::WriteStringToFile(bytes, kPartition));
  }
  static void set_record(const std::string& record) {
    set_partition(std::string(kRecordOffset, 'p') + record);
  }
  static std::string partition() {
    std::string bytes;
    EXPECT_TRUE(android::base::ReadFileToString(kPartition, &bytes));
    return bytes;
  }

  struct stat device_status_ = {};

 private:
  std::unique_ptr<sentrova::testing::LoopDevice> device_;
  std::unique_ptr<sentrova::testing::ScopedTmpfs> dev_;
};

TEST_F(DataDump, ArmsMovesAndDisarmsWithoutTouchingTheRestOfThePartition) {
  if (device_status_.st_rdev == 0 ||
      mknod(kPartition, S_IFBLK | 0600, device_status_.st_rdev) != 0) {
    GTEST_SKIP() << "no block device here";
  }
  const std::string blank(4096, 'p');
  set_partition(blank);
  const std::tuple<std::function<int()>, std::string, int> steps[] = {
      {datadump_enable, kMagics + "\0\0\0\0\0\0\0\0"s, 1},
      {[] { return datadump_resize(0x8877665544332211); },
       kMagics + "\x11\x22\x33\x44\x55\x66\x77\x88", 2},
      {[] { return datadump_resize(0); }, kMagics + "\0\0\0\0\0\0\0\0"s, 1},
      {[] { return datadump_resize(uint64_t{1} << 32); }, kMagics + "\0\0\0\0\1\0\0\0"s, 2},
      {datadump_enable, kMagics + "\0\0\0\0\0\0\0\0"s, 1},
      {datadump_disable, std::string(16, '\0'), 0},
  };
  for (const auto& [call, record, status] : steps) {
    EXPECT_EQ(call(), 0);
    EXPECT_EQ(partition(), std::string(blank).replace(kRecordOffset, record.size(), record));
    EXPECT_EQ(datadump_get_status(), status);
  }
  EXPECT_THAT(log_lines, IsEmpty());
}

TEST_F(DataDump, IsArmedOnlyByBothMagicsAndTellsTheRecordWhateverItHolds) {
  const std::string offset = "\1\0\0\0\0\0\0\0"s;
  const std::pair<std::string, int> cases[] = {
      {kMagics + offset, 2},
      {std::string(16, '\0'), 0},
      {kMagics.substr(0, 4) + "\0\0\0\0"s + offset, 0},
      {"\0\0\0\0"s + kMagics.substr(4) + offset, 0},
      {"\0\xE2\x15\xE2\0\x6B\x6B\x6B"s + offset, 0},  // the other byte order
  };
  for (const auto& [bytes, status] : cases) {
    set_record(bytes);
    EXPECT_EQ(datadump_get_status(), status);
    EXPECT_EQ(datadump_resize(5), status == 0 ? -1 : 0);
    EXPECT_EQ(partition().substr(kRecordOffset),
              status == 0 ? bytes : kMagics + "\5\0\0\0\0\0\0\0"s);
  }
  uint32_t first = 1, second = 2;
  uint64_t place = 3;
  const auto query = [&] { return datadump_query_flags(&first, &second, &place); };
  set_record("\1\2\3\4\5\6\7\x08\x09\x0A\x0B\x0C\x0D\x0E\x0F\xF0");
  for (const int result : {0, -1}) {
    EXPECT_EQ(query(), result);
    EXPECT_THAT((std::vector<uint64_t>{first, second, place}),
                ElementsAre(0x04030201U, 0x08070605U, 0xF00F0E0D0C0B0A09U));
    std::filesystem::remove(kPartition);
  }
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
  ASSERT_EQ(mount(nullptr, "/dev", nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
  expect_failures(failure("Open", "Read-only file system"));
  EXPECT_EQ(datadump_get_status(), 2);
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
