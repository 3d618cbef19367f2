#include <android-base/file.h>
#include <android-base/properties.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdint.h>
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
using sentrova::testing::SleepScript;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::SizeIs;

// A store of properties that nobody else uses.
class System : public ::testing::Test {
 protected:
  void SetUp() override { setenv("ANDROID_PROPERTY_DIR", directory_.path, 1); }
  void TearDown() override { unsetenv("ANDROID_PROPERTY_DIR"); }

  TemporaryDir directory_;
};

TEST_F(System, SetsThePerformanceModeAndGivesItHalfASecond) {
  std::string seen;
  SleepScript sleeps([&](size_t) { seen += GetProperty("recovery.perf.mode", "?"); });
  EXPECT_EQ(ZunoFunc::SetPerformanceMode(true) + ZunoFunc::SetPerformanceMode(false), 0);
  EXPECT_EQ(seen, "10");
  EXPECT_THAT(sleeps.microseconds(), ElementsAre(500'000, 500'000));
}

TEST_F(System, IsAnEngBuildByTheExactTypeOnly) {
  EXPECT_FALSE(ZunoFunc::Is_Eng_Build());
  for (const char* type : {"eng", "user", "engineering", "Eng", ""}) {
    const std::string file = std::string(directory_.path) + "/ro.build.type";
    ASSERT_TRUE(android::base::WriteStringToFile(type, file));
    EXPECT_EQ(ZunoFunc::Is_Eng_Build(), std::string(type) == "eng") << type;
  }
}

TEST_F(System, WaitsForAPropertyUntilALookFindsTheValue) {
  struct Row {
    const char *name, *value;
    double timeout_seconds;
    bool found;
    size_t looks;
  };
  for (const Row& row :
       {Row{"test.ready", "1", 5.0, true, 3}, Row{"test.ready", "old", 0, false, 1},
        Row{"test.absent", "", 1.0, true, 1}, Row{"", "", 1.0, false, 0}}) {
    SetProperty("test.ready", "old");
    const SleepScript sleeps([](size_t count) {
      SetProperty("test.ready", count == 2 ? "11" : count == 3 ? "1" : "0");
    });
    EXPECT_EQ(ZunoFunc::wait_for_property(row.name, row.value, row.timeout_seconds), row.found);
    EXPECT_THAT(sleeps.microseconds(), SizeIs(row.looks)) << row.name << row.value;
  }
}

TEST_F(System, LooksForABlockDeviceEach100MillisecondsAndAtLeastOnce) {
  using Limits = std::numeric_limits<double>;
  struct Row {
    const char* path;
    double timeout_seconds;
    size_t looks;
  };
  for (const Row& row :
       {Row{"/absent", 0, 1}, Row{"/absent", -3, 1}, Row{"/absent", Limits::quiet_NaN(), 1},
        Row{"/absent", 0.199, 1}, Row{"/absent", 0.3, 3}, Row{"/absent", 5.05, 50},
        Row{"/", Limits::infinity(), 1}, Row{"", 1.0, 0}}) {
    const SleepScript sleeps;
    const bool is_there = std::string(row.path) == "/";
    EXPECT_EQ(ZunoFunc::wait_for_block_device(row.path, row.timeout_seconds), is_there);
    EXPECT_THAT(sleeps.microseconds(), SizeIs(row.looks)) << row.timeout_seconds;
    EXPECT_THAT(sleeps.microseconds(), Each(100'000));
  }
  const sentrova::testing::RepeatedInterruption interruption;
  const auto begin = std::chrono::steady_clock::now();
  EXPECT_FALSE(ZunoFunc::wait_for_block_device("/absent", 0.5));
  EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(500));
}

TEST_F(System, CountsTheFileSystemOnWhichAPathLies) {
  struct statvfs status;
  ASSERT_EQ(statvfs(directory_.path, &status), 0);
  unsigned long long total = 0, free = 0, available = 0;
  EXPECT_TRUE(ZunoFunc::Get_Blk_Device_Size(directory_.path, total, free, available));
  EXPECT_EQ(total, status.f_blocks * status.f_bsize);
  EXPECT_GE(total, free);
  EXPECT_GE(free, available);
  EXPECT_GT(available, 0U);
  sentrova::testing::CapturedStdout output;
  EXPECT_FALSE(ZunoFunc::Get_Blk_Device_Size("/absent", total, free, available));
  EXPECT_EQ(output.take(),
            "[ZunoFunc]I: block device '/absent' not exit(No such file or directory)\n");
  EXPECT_EQ(total + free + available, 0U);
}

TEST(Time, DifferencesBorrowFromTheSecondsOrWrapAt32BitsOfMilliseconds) {
  struct Row {
    timespec start, end, difference;
    int milliseconds;
  };
  for (Row row : {Row{{1, 900'000'000}, {3, 100'000'000}, {1, 200'000'000}, 1200},
                  Row{{3, 100'000'000}, {1, 900'000'000}, {-2, 800'000'000}, -1200},
                  Row{{0, 999'999}, {0, 1'000'000}, {0, 1}, 1},
                  Row{{0, 0}, {2'147'484, 0}, {2'147'484, 0}, -2'147'483'296},
                  Row{{0, 0}, {int64_t{1} << 40, 0}, {int64_t{1} << 40, 0}, 0}}) {
    const timespec difference = ZunoFunc::timespec_diff(row.start, row.end);
    EXPECT_EQ(difference.tv_sec, row.difference.tv_sec);
    EXPECT_EQ(difference.tv_nsec, row.difference.tv_nsec);
    EXPECT_EQ(ZunoFunc::timespec_diff_ms(row.start, row.end), row.milliseconds);
  }
}

TEST(Time, OfTodayIsLocalInItsForm) {
  const std::string outer_zone = getenv("TZ") != nullptr ? getenv("TZ") : "";
  tzset();
  setenv("TZ", "XYZ-5:30", 1);  // five and a half hours ahead, so that UTC would show
  const time_t before = time(nullptr);
  const std::string date = ZunoFunc::Get_Current_Date();
  const time_t after = time(nullptr);
  tm parsed = {};
  const char* end = strptime(date.c_str(), "%Y-%m-%d--%H-%M-%S", &parsed);
  EXPECT_TRUE(end != nullptr && *end == '\0' && date.size() == 20) << date;
  const time_t shown = timegm(&parsed) - (5 * 60 + 30) * 60;
  EXPECT_TRUE(before <= shown && shown <= after) << date;
  outer_zone.empty() ? unsetenv("TZ") : setenv("TZ", outer_zone.c_str(), 1);
  tzset();
}

}  // namespace
