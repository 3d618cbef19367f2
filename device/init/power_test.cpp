#include "device/init/power.h"

#include <gtest/gtest.h>

namespace sentrova::device {
namespace {

TEST(ParsePowerRequest, ReadsActionAndReasonAndNothingElse) {
  const std::pair<const char*, const char*> rows[] = {{"reboot", "reboot:"},
                                                      {"reboot,", "reboot:"},
                                                      {"reboot,a,b", "reboot:a,b"},
                                                      {"shutdown", "shutdown:"},
                                                      {"shutdown,hot", "shutdown:hot"},
                                                      {"", "none"},
                                                      {",reboot", "none"},
                                                      {"rebootx", "none"},
                                                      {"Reboot", "none"},
                                                      {"shutdownthermal,", "none"}};
  for (const auto& [value, expected] : rows) {
    const std::optional<PowerRequest> request = parse_power_request(value);
    EXPECT_EQ(request ? (request->reboot ? "reboot:" : "shutdown:") + request->reason : "none",
              expected);
  }
}

}  // namespace
}  // namespace sentrova::device
