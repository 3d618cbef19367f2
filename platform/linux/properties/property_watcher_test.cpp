#include "platform/linux/properties/property_watcher.h"

#include <android-base/file.h>
#include <android-base/properties.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>

namespace sentrova {
namespace {

using android::base::SetProperty;
using testing::ElementsAre;
using testing::IsEmpty;
using namespace std::chrono_literals;

class PropertyWatcherTest : public testing::Test {
 protected:
  PropertyWatcherTest() { setenv("ANDROID_PROPERTY_DIR", folder_.path, 1); }
  ~PropertyWatcherTest() override { unsetenv("ANDROID_PROPERTY_DIR"); }

  TemporaryDir folder_;
};

TEST_F(PropertyWatcherTest, TellsEachChangedNameOnceAndNoTemporaryFile) {
  std::optional<PropertyWatcher> watcher = PropertyWatcher::create();
  ASSERT_TRUE(watcher);
  ASSERT_TRUE(SetProperty("ctl.start", "one"));
  ASSERT_TRUE(SetProperty("ro.fixed", "value"));
  ASSERT_TRUE(SetProperty("ctl.start", "two"));
  EXPECT_FALSE(SetProperty("ro.fixed", "refused"));
  ASSERT_TRUE(android::base::WriteStringToFile("v", folder_.path + std::string("/by.hand")));
  const std::optional<PropertyChanges> changes = watcher->wait(0ms);
  ASSERT_TRUE(changes);
  EXPECT_THAT(changes->names, ElementsAre("ctl.start", "ro.fixed", "by.hand"));
  EXPECT_FALSE(changes->rescan);
  EXPECT_THAT(watcher->wait(0ms)->names, IsEmpty());

  const auto start = std::chrono::steady_clock::now();
  if (const pid_t child = fork(); child == 0) {
    usleep(50'000);
    _exit(SetProperty("sys.powerctl", "reboot") ? 0 : 1);
  }
  std::vector<std::string> names;  // of the temporary file there is none
  while (names.empty() && std::chrono::steady_clock::now() - start < 10s) {
    names = watcher->wait(10s)->names;
  }
  EXPECT_THAT(names, ElementsAre("sys.powerctl"));
  wait(nullptr);
}

}  // namespace
}  // namespace sentrova
