#pragma once

#include <android-base/file.h>
#include <android-base/logging.h>
#include <gtest/gtest.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "recovery_utils/roots.h"
#include "tests/support/captured_stdout.h"
#include "tests/support/fake_fs_mgr.h"
#include "tests/support/private_mounts.h"

namespace sentrova::testing {

// A test of the volume table on a machine whose devices, control files, data and properties are the
// test's own and empty at first, and whose platform is the fake.
class RootsTest : public ::testing::Test {
 protected:
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
    for (const char* folder : {"/dev", "/sys", "/data"}) {
      folders_.push_back(std::make_unique<ScopedTmpfs>(folder));
    }
    properties_ = std::make_unique<TemporaryDir>();
    setenv("ANDROID_PROPERTY_DIR", properties_->path, 1);
  }

  // Makes these rows the whole table, untouched by any rule: what a failed read leaves stays.
  void set_table(const android::fs_mgr::Fstab& rows) {
    provide_fstab(rows, false);
    load_volume_table();
  }

  // Lets the platform read these rows from now on, with this result.
  void provide_fstab(const android::fs_mgr::Fstab& rows, bool result = true) {
    platform_.read_default_fstab = [rows, result](auto* table) {
      *table = rows;
      return result;
    };
  }

  // Makes the file and the directories above it.
  static void make_file(const std::string& path) {
    std::filesystem::create_directories(std::filesystem::path(path).parent_path());
    ASSERT_TRUE(android::base::WriteStringToFile("", path)) << path;
  }

  // Returns what `body` writes to standard output.
  static std::string output_of(const std::function<void()>& body) {
    CapturedStdout output;
    body();
    return output.take();
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
