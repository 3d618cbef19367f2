#include <gtest/gtest.h>
#include <stdint.h>
#include <stdlib.h>

#include "toolkit/zuno_func.h"

namespace {

TEST(TimespecDiff, BorrowsNanosecondsFromTheSeconds) {
  struct Case {
    timespec start, end, difference;
  };
  const Case cases[] = {{{1, 900'000'000}, {3, 100'000'000}, {1, 200'000'000}},
                        {{3, 100'000'000}, {1, 900'000'000}, {-2, 800'000'000}}};
  for (Case c : cases) {
    const timespec difference = ZunoFunc::timespec_diff(c.start, c.end);
    EXPECT_EQ(difference.tv_sec, c.difference.tv_sec);
    EXPECT_EQ(difference.tv_nsec, c.difference.tv_nsec);
  }
}

TEST(TimespecDiffMs, CutsBothTimesBeforeItSubtractsAndWrapsAt32Bits) {
  struct Case {
    timespec start, end;
    int milliseconds;
  };
  const Case cases[] = {{{1, 900'000'000}, {3, 100'000'000}, 1200},
                        {{0, 999'999}, {0, 1'000'000}, 1},
                        {{3, 0}, {1, 500'000'000}, -1500},
                        {{0, 0}, {2'147'484, 0}, -2'147'483'296},
                        {{0, 0}, {4'294'968, 0}, 704},
                        {{0, 0}, {int64_t{1} << 40, 0}, 0}};
  for (Case c : cases) {
    EXPECT_EQ(ZunoFunc::timespec_diff_ms(c.start, c.end), c.milliseconds);
  }
}

TEST(GetCurrentDate, IsTheLocalTimeInItsForm) {
  const std::string outer_zone = getenv("TZ") != nullptr ? getenv("TZ") : "";
  setenv("TZ", "XYZ-5:30", 1);  // five and a half hours ahead, so that UTC would show
  const time_t before = time(nullptr);
  const std::string date = ZunoFunc::Get_Current_Date();
  const time_t after = time(nullptr);
  tm parsed = {};
  const char* end = strptime(date.c_str(), "%Y-%m-%d--%H-%M-%S", &parsed);
  EXPECT_TRUE(end != nullptr && *end == '\0') << date;
  EXPECT_EQ(date.size(), 20U) << date;
  const time_t shown = timegm(&parsed) - (5 * 60 + 30) * 60;
  EXPECT_TRUE(before <= shown && shown <= after) << date;
  outer_zone.empty() ? unsetenv("TZ") : setenv("TZ", outer_zone.c_str(), 1);
  tzset();
}

}  // namespace
