#include <gtest/gtest.h>
#include <sys/wait.h>

#include <chrono>

#include "tests/support/captured_stdout.h"
#include "toolkit/zuno_func.h"

namespace {

using sentrova::testing::CapturedStdout;
using std::chrono::seconds;
using std::chrono::steady_clock;

TEST(DeviceShell, RunsCommandsAndGivesTheirOutput) {
  std::string result;
  EXPECT_EQ(ZunoFunc::Exec_Cmd("echo $0; exit 6", result), 6 << 8);
  EXPECT_EQ(result, "sh\n");
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::Exec_Cmd("test -x /system/bin/sh"), 0);
}

TEST(DeviceShell, AChildThatIgnoresEverythingIsKilledInTime) {
  CapturedStdout output;
  const pid_t pid = ZunoFunc::Exec_Cmd(std::vector<std::string>{
      "/system/bin/sh", "-c", "trap '' TERM INT HUP QUIT; while :; do sleep 0.1; done"});
  ASSERT_GT(pid, 0);
  const auto start = steady_clock::now();
  int status = 0;
  EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(pid, &status, "stubborn", 2), -1);
  const auto taken = steady_clock::now() - start;
  EXPECT_GE(taken, seconds(3));  // two of patience and one until the first look after the kill
  EXPECT_LT(taken, seconds(5));
  EXPECT_EQ(WTERMSIG(status), SIGKILL);
  EXPECT_EQ(waitpid(pid, nullptr, WNOHANG), -1);
}

}  // namespace
