#pragma once

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/properties.h>
#include <errno.h>
#include <gmock/gmock.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <type_traits>
#include <vector>

#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "tests/support/captured_stdout.h"
#include "tests/support/fake_fs_mgr.h"
#include "tests/support/private_mounts.h"

namespace sentrova::testing {

using android::base::GetProperty;
using android::base::SetProperty;
using android::dm::DmDeviceState;
using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using ::testing::AllOf;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::StartsWith;

// A test of the volume table on a machine whose devices, control files, data, properties and table
// of mounts are the test's own and empty at first, and whose platform is the fake. Mounts are
// played while the test has a KernelScript.
class RootsTest : public ::testing::Test {
 protected:
  using Texts = std::vector<std::string>;

  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    clear_machine();
    set_table({});
    platform_.reset();
  }
  void TearDown() override { unsetenv("ANDROID_PROPERTY_DIR"); }

  // Begins with no file and no property, also of those that can be set but once.
  void clear_machine() {
    folders_.clear();
    for (const char* folder : {"/dev", "/sys", "/data", "/proc", "/system"}) {
      folders_.push_back(std::make_unique<ScopedTmpfs>(folder));
    }
    set_mounted("/");
    properties_ = std::make_unique<TemporaryDir>();
    setenv("ANDROID_PROPERTY_DIR", properties_->path, 1);
  }

  // Makes these rows the whole table, untouched by any rule: what a failed read leaves stays.
  void set_table(const Fstab& rows) {
    provide_fstab(rows, false);
    output_of(load_volume_table);
  }

  // Lets the platform read these rows from now on, with this result.
  void provide_fstab(const Fstab& rows, bool result = true) {
    platform_.read_default_fstab = [rows, result](auto* table) { return *table = rows, result; };
  }

  // Makes this the only mount point in the kernel's table; "": the table cannot be read.
  static void set_mounted(const std::string& mount_point) {
    std::filesystem::remove("/proc/mounts");
    if (!mount_point.empty()) {
      make_file("/proc/mounts", "/dev/block/any " + mount_point + " ext4 rw 0 0\n");
    }
  }

  // Makes the file and the directories above it.
  static void make_file(const std::string& path, const std::string& content = "") {
    std::filesystem::create_directories(std::filesystem::path(path).parent_path());
    ASSERT_TRUE(android::base::WriteStringToFile(content, path)) << path;
  }
  static std::string content_of(const std::string& path) {
    std::string text;
    return android::base::ReadFileToString(path, &text) ? text : "(none)";
  }

  // Returns what `body`, whose result must be as expected if that is given, writes to standard
  // output, with the fakes' calls and the lines of the base log, as "E roots.cpp:122 text", at
  // their places. The log destroys `errno`.
  static std::string output_of(const std::function<void()>& body) {
    CapturedStdout output;
    android::base::SetLogger([](auto, auto severity, auto, auto file, auto line, auto text) {
      printf("%c %s:%u %s\n", "VDIWEFF"[severity], file, line, text);
      errno = 0;
    });
    body();
    android::base::SetLogger(android::base::StderrLogger);
    return output.take();
  }
  template <typename Body>
  static std::string output_of(const Body& body, const std::invoke_result_t<Body>& expected) {
    std::invoke_result_t<Body> result{};
    std::string output = output_of([&] { result = body(); });
    EXPECT_EQ(result, expected) << output;
    return output;
  }

  static std::string repeat(size_t count, const std::string& text) {
    std::string result;
    while (count-- > 0) {
      result += text;
    }
    return result;
  }

  // Runs `body` in a process in which what the library does once is still to be done. What fails
  // there fails here.
  static void in_new_process(const std::function<void()>& body) {
    fflush(stdout);
    const pid_t child = fork();
    if (child == 0) {
      body();
      fflush(stdout);
      _exit(HasFailure() ? 1 : 0);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0) << "the process in which the test ran tells why above";
  }

  FakeFsMgr& platform_ = FakeFsMgr::instance();

 private:
  std::unique_ptr<TemporaryDir> properties_;
  std::vector<std::unique_ptr<ScopedTmpfs>> folders_;
};

}  // namespace sentrova::testing
