#include "device/init/power.h"

#include <gtest/gtest.h>

namespace sentrova::device {
namespace {

TEST(ParsePowerRequest, ReadsActionAndReason) {
  struct Case {
    const char* value;
    bool reboot;
    const char* reason;
  };
  for (const Case& c : {Case{"reboot", true, ""}, Case{"reboot,", true, ""},
                        Case{"reboot,recovery", true, "recovery"}, Case{"reboot,a,b", true, "a,b"},
                        Case{"shutdown", false, ""}, Case{"shutdown,thermal", false, "thermal"}}) {
    const std::optional<PowerRequest> request = parse_power_request(c.value);
    ASSERT_TRUE(request) << c.value;
    EXPECT_EQ(request->reboot, c.reboot) << c.value;
    EXPECT_EQ(request->reason, c.reason) << c.value;
  }
}

TEST(ParsePowerRequest, RefusesAnythingElse) {
  for (const char* value : {"", ",reboot", "rebootx", "Reboot", "shutdownthermal,", "halt"}) {
    EXPECT_FALSE(parse_power_request(value)) << value;
  }
}

}  // namespace
}  // namespace sentrova::device
