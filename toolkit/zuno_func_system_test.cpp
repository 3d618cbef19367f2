#include <android-base/file.h>
#include <android-base/properties.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/statvfs.h>

#include <chrono>
#include <limits>

#include "tests/support/captured_stdout.h"
#include "tests/support/signals.h"
#include "tests/support/sleep_script.h"
#include "toolkit/zuno_func.h"

namespace {

using android::base::GetProperty;
using android::base::SetProperty;
using sentrova::testing::CapturedStdout;
using sentrova::testing::RepeatedInterruption;
using sentrova::testing::SleepScript;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::SizeIs;

// A store of properties that nobody else uses.
class Properties : public ::testing::Test {
 protected:
  void SetUp() override { setenv("ANDROID_PROPERTY_DIR", directory_.path, 1); }
  void TearDown() override { unsetenv("ANDROID_PROPERTY_DIR"); }

  TemporaryDir directory_;
};

TEST_F(Properties, PerformanceModeIsSetAndThenGivenHalfASecond) {
  std::string seen;
  SleepScript sleeps([&](size_t) { seen += GetProperty("recovery.perf.mode", "?"); });
  EXPECT_EQ(ZunoFunc::SetPerformanceMode(true), 0);
  EXPECT_EQ(ZunoFunc::SetPerformanceMode(false), 0);
  EXPECT_EQ(seen, "10");
  EXPECT_THAT(sleeps.microseconds(), ElementsAre(500'000, 500'000));
}

TEST_F(Properties, OnlyTheExactTypeEngIsAnEngBuild) {
  const std::string file = std::string(directory_.path) + "/ro.build.type";
  EXPECT_FALSE(ZunoFunc::Is_Eng_Build());
  for (const char* type : {"eng", "user", "userdebug", "engineering", "Eng", ""}) {
    ASSERT_TRUE(android::base::WriteStringToFile(type, file));
    EXPECT_EQ(ZunoFunc::Is_Eng_Build(), std::string(type) == "eng") << type;
  }
}

TEST_F(Properties, WaitEndsWithTheFirstLookThatFindsTheValue) {
  SleepScript sleeps([](size_t count) {
    SetProperty("test.ready", count == 2 ? "11" : count == 3 ? "1" : "0");
  });
  EXPECT_TRUE(ZunoFunc::wait_for_property("test.ready", "1", 5.0));
  EXPECT_THAT(sleeps.microseconds(), ElementsAre(100'000, 100'000, 100'000));
}

TEST_F(Properties, WaitSleepsBeforeTheFirstLook) {
  SetProperty("test.ready", "1");
  SleepScript sleeps([](size_t) { SetProperty("test.ready", "0"); });
  EXPECT_FALSE(ZunoFunc::wait_for_property("test.ready", "1", 0));
  EXPECT_THAT(sleeps.microseconds(), SizeIs(1));
}

TEST_F(Properties, AnAbsentPropertyHasTheEmptyValueAndAnEmptyNameIsRefused) {
  SleepScript sleeps;
  EXPECT_TRUE(ZunoFunc::wait_for_property("test.absent", "", 1.0));
  EXPECT_THAT(sleeps.microseconds(), SizeIs(1));
  EXPECT_FALSE(ZunoFunc::wait_for_property("", "", 1.0));
  EXPECT_THAT(sleeps.microseconds(), SizeIs(1));
}

TEST(WaitForBlockDevice, LooksOnceEach100MillisecondsAndAtLeastOnce) {
  const std::pair<double, size_t> cases[] = {
      {0.05, 1}, {0, 1},     {-3, 1},  {std::numeric_limits<double>::quiet_NaN(), 1},
      {0.1, 1},  {0.199, 1}, {0.3, 3}, {4.0, 40},
      {5.05, 50}};
  for (const auto& [timeout_seconds, looks] : cases) {
    SleepScript sleeps;
    EXPECT_FALSE(ZunoFunc::wait_for_block_device("/absent", timeout_seconds));
    EXPECT_THAT(sleeps.microseconds(), SizeIs(looks)) << timeout_seconds;
    EXPECT_THAT(sleeps.microseconds(), Each(100'000));
  }
}

TEST(WaitForBlockDevice, EndsWithTheFirstLookAtWhatIsThere) {
  const SleepScript sleeps;
  EXPECT_TRUE(ZunoFunc::wait_for_block_device("/", std::numeric_limits<double>::infinity()));
  EXPECT_THAT(sleeps.microseconds(), SizeIs(1));
  EXPECT_FALSE(ZunoFunc::wait_for_block_device("", 1.0));
  EXPECT_THAT(sleeps.microseconds(), SizeIs(1));
}

TEST(WaitForBlockDevice, TakesItsTimeWhileSignalsInterruptIt) {
  const RepeatedInterruption interruption;
  const auto begin = std::chrono::steady_clock::now();
  EXPECT_FALSE(ZunoFunc::wait_for_block_device("/absent", 0.5));
  EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(500));
}

TEST(GetBlkDeviceSize, CountsTheFileSystemOnWhichThePathLies) {
  const TemporaryDir directory;
  struct statvfs status;
  ASSERT_EQ(statvfs(directory.path, &status), 0);
  unsigned long long total = 0, free = 0, available = 0;
  ASSERT_TRUE(ZunoFunc::Get_Blk_Device_Size(directory.path, total, free, available));
  EXPECT_EQ(total, status.f_blocks * status.f_bsize);
  EXPECT_GE(free, available);
}

TEST(GetBlkDeviceSize, ZeroesItsResultsForAMissingPath) {
  unsigned long long total = 1, free = 2, available = 3;
  CapturedStdout output;
  EXPECT_FALSE(ZunoFunc::Get_Blk_Device_Size("/absent", total, free, available));
  EXPECT_EQ(output.take(),
            "[ZunoFunc]I: block device '/absent' not exit(No such file or directory)\n");
  EXPECT_EQ(total + free + available, 0U);
}

TEST(IoctlGetBlockSize, FailsForWhatIsNoBlockDevice) {
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::IOCTL_Get_Block_Size("/absent"), 0U);
  EXPECT_EQ(ZunoFunc::IOCTL_Get_Block_Size("/dev/null"), 0U);
  EXPECT_EQ(output.take(),
            "[ZunoFunc]I: Find_Partition_Size: Failed to open '/absent', (No such file or "
            "directory)\n"
            "[ZunoFunc]I: Find_Partition_Size: ioctl error: (Inappropriate ioctl for device)\n");
}

}  // namespace
