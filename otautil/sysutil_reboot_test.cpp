#include <android-base/file.h>
#include <android-base/properties.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <string>
#include <vector>

#include "otautil/sysutil.h"

namespace {

using android::base::GetProperty;
using android::base::SetProperty;

// sys.powerctl takes a value of at most 91 bytes.
const std::string kTooLong(91, 'x');

std::string requested() {
  return GetProperty("sys.powerctl", "none");
}

// A property store of the test's own.
class PowerRequests : public ::testing::Test {
 protected:
  PowerRequests() { setenv("ANDROID_PROPERTY_DIR", properties_.path, 1); }
  ~PowerRequests() override { unsetenv("ANDROID_PROPERTY_DIR"); }

 private:
  const TemporaryDir properties_;
};

// Runs Reboot in a child until it sleeps and a signal has failed to make it go on.
void expect_reboot(const std::string& reason, const std::string& expected) {
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
  EXPECT_EQ(waitpid(child, nullptr, WNOHANG), 0) << "Reboot returned";
  kill(child, SIGKILL);
  waitpid(child, nullptr, 0);
}

TEST_F(PowerRequests, RebootAsksOnceAndNeverReturns) {
  const struct {
    const char* reason;
    const char* quiescent;
    const char* expected;
  } cases[] = {
      {"recovery", "", "reboot,recovery"},
      {"recovery", "0", "reboot,recovery"},
      {"recovery", "1", "reboot,recovery,quiescent"},
      {"", "", "reboot,"},
      {"", "true", "reboot,,quiescent"},
      {"bootloader", "1", "reboot,bootloader"},
      {"fastboot", "1", "reboot,fastboot"},
      {"bootloader2", "1", "reboot,bootloader2,quiescent"},
  };
  for (const auto& [reason, quiescent, expected] : cases) {
    const TemporaryDir properties;
    setenv("ANDROID_PROPERTY_DIR", properties.path, 1);
    if (*quiescent != '\0') {
      ASSERT_TRUE(SetProperty("ro.boot.quiescent", quiescent));
    }
    expect_reboot(reason, expected);
  }
}

TEST_F(PowerRequests, ARebootThatCannotBeAskedForIsFatal) {
  EXPECT_EXIT(Reboot(kTooLong), ::testing::KilledBySignal(SIGABRT), "Reboot failed");
  EXPECT_EQ(requested(), "none");
}

TEST_F(PowerRequests, ShutdownAsksAndTellsWhetherItCould) {
  ASSERT_TRUE(SetProperty("ro.boot.quiescent", "1"));
  for (const std::string reason : {"", "thermal"}) {
    EXPECT_TRUE(Shutdown(reason));
    EXPECT_EQ(requested(), "shutdown," + reason);
  }
  EXPECT_FALSE(Shutdown(kTooLong));
  EXPECT_EQ(requested(), "shutdown,thermal");
}

TEST(StringVectorToNullTerminatedArray, PointsAtTheArgumentsAndEndsWithNull) {
  EXPECT_EQ(StringVectorToNullTerminatedArray({}), std::vector<char*>{nullptr});
  const std::vector<std::string> arguments{"/system/bin/tool", ""};
  const std::vector<char*> array = StringVectorToNullTerminatedArray(arguments);
  ASSERT_EQ(array.size(), 3u);
  EXPECT_EQ(array[0], arguments[0].data());
  EXPECT_EQ(array[1], arguments[1].data());
  EXPECT_EQ(array[2], nullptr);
}

}  // namespace
