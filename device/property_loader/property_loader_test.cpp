#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/properties.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <memory>

#include "device/property_loader/loader.h"
#include "device/property_loader/property_file.h"
#include "tests/support/private_mounts.h"

namespace {

using android::base::GetProperty;
using android::base::SetProperty;
using android::base::WriteStringToFile;
using sentrova::device::answer_requests;
using sentrova::device::kMaxPropertyFileBytes;
using sentrova::testing::ScopedTmpfs;
using ::testing::HasSubstr;

class PropertyLoader : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    for (const char* folder : {"/tmp", "/oem", "/kcf", "/vendor", "/cache", "/data"}) {
      folders_.push_back(std::make_unique<ScopedTmpfs>(folder));
    }
    properties_ = std::make_unique<TemporaryDir>();
    setenv("ANDROID_PROPERTY_DIR", properties_->path, 1);
    android::base::SetLogger([this](auto, auto, auto, auto, auto, const char* text) {
      log_ += text + std::string("\n");
    });
  }
  void TearDown() override {
    if (properties_ != nullptr) {
      android::base::SetLogger(android::base::StderrLogger);
      unsetenv("ANDROID_PROPERTY_DIR");
    }
  }

  static void put(const std::string& path, const std::string& text) {
    std::filesystem::create_directories(std::filesystem::path(path).parent_path());
    ASSERT_TRUE(WriteStringToFile(text, path)) << path;
  }

  // Asks and has it answered; the ready properties of oem and kcf.
  static std::string ask(const char* request, const char* completion) {
    SetProperty(request, "1");
    answer_requests();
    EXPECT_EQ(GetProperty(request, ""), "0");
    EXPECT_EQ(GetProperty(completion, ""), "1");
    return GetProperty("recovery.oem_properties.ready", "") + " " +
           GetProperty("recovery.kcf_properties.ready", "");
  }
  static std::string load() { return ask("recovery.load.props", "recovery.properties.loaded"); }
  static std::string load_backups() {
    return ask("recovery.load.backup_props", "recovery.backup_props.loaded");
  }

  static std::string contents(const std::string& path) {
    std::string text;
    return android::base::ReadFileToString(path, &text) ? text : "absent";
  }

  std::string log_;

 private:
  std::vector<std::unique_ptr<ScopedTmpfs>> folders_;
  std::unique_ptr<TemporaryDir> properties_;
};

TEST_F(PropertyLoader, LoadsWhatIsAskedForAndKeepsTheGoodCopy) {
  put("/tmp/oem.prop", "good");
  put("/cache/recovery/oem.prop", "ro.two = from the backup \n# comment\n\noem.two=a=b");
  put("/cache/recovery/kcf.prop", "");
  EXPECT_EQ(load(), "false false");
  EXPECT_EQ(contents("/tmp/oem.prop"), "good");
  EXPECT_EQ(load_backups(), "true false") << "an empty backup is none";
  EXPECT_EQ(GetProperty("ro.two", "") + GetProperty("oem.two", ""), "from the backupa=b");
  EXPECT_EQ(contents("/tmp/oem.prop"), contents("/cache/recovery/oem.prop"));

  put("/data/property/persistent_properties", "persist.sys.language=en\nro.debuggable=1\n");
  ask("recovery.load.persist_props", "recovery.persist_properties.loaded");
  EXPECT_EQ(GetProperty("recovery.persistent_properties.ready", ""), "true");
  EXPECT_EQ(GetProperty("persist.sys.language", "") + GetProperty("ro.debuggable", ""), "en");
}

TEST_F(PropertyLoader, SkipsLinesThatWillNotDoAndSaysWhich) {
  put("/oem/oem.prop", "no equals\nat.limit=" + std::string(91, 'v') +
                           "\nover.limit=" + std::string(92, 'v') +
                           "\nctl.stop=rescue_host\nsys.powerctl=reboot\nrecovery.repair_mode=1\n"
                           "../name=x\nafter=it\n");
  EXPECT_EQ(load(), "true false");
  EXPECT_EQ(GetProperty("at.limit", "").size(), 91U);
  EXPECT_EQ(GetProperty("after", ""), "it");
  for (const char* name : {"over.limit", "ctl.stop", "sys.powerctl", "recovery.repair_mode"}) {
    EXPECT_EQ(GetProperty(name, "unset"), "unset") << name;
  }
  EXPECT_THAT(log_, HasSubstr("/oem/oem.prop:1: skipped: no \"=\" in the line\n"));
  EXPECT_THAT(log_, HasSubstr("/oem/oem.prop:3: skipped: the value of over.limit has 92 bytes"));
  EXPECT_THAT(log_, HasSubstr("not to be set from a file: ctl.stop\n"));
  EXPECT_THAT(log_, HasSubstr("cannot set ../name"));
}

TEST_F(PropertyLoader, RefusesWhatIsNoPropertyFile) {
  put("/tmp/elsewhere", "stolen=1\n");
  ASSERT_EQ(symlink("/tmp/elsewhere", "/oem/oem.prop"), 0);
  ASSERT_EQ(mkfifo("/kcf/kcf.prop", 0600), 0);
  EXPECT_EQ(load(), "false false");
  EXPECT_EQ(GetProperty("stolen", ""), "");
  unlink("/oem/oem.prop");
  put("/oem/oem.prop", "a=b\n" + std::string(kMaxPropertyFileBytes, '\n'));
  EXPECT_EQ(load(), "false false");
}

}  // namespace
