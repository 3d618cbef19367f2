#pragma once

#include <android-base/file.h>
#include <android-base/logging.h>
#include <errno.h>
#include <gtest/gtest.h>
#include <stdio.h>

#include <functional>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "recovery_utils/roots_test.h"
#include "tests/support/fake_device_mapper.h"
#include "tests/support/kernel_script.h"
#include "tests/support/private_mounts.h"

namespace sentrova::testing {

// A test of mounting and unmounting where, besides what RootsTest provides, the kernel's table of
// mounts is the test's own, as is all of /proc, and the device mapper is the fake. Mounts are
// played while the test has a KernelScript.
class MountTest : public RootsTest {
 protected:
  using Calls = std::vector<std::string>;

  void SetUp() override {
    RootsTest::SetUp();
    if (!IsSkipped()) {
      device_mapper_.reset();
      proc_.emplace("/proc");
      set_mounted("/");
    }
  }

  // Makes this the only mount point in the kernel's table; "": the table cannot be read.
  static void set_mounted(const std::string& mount_point) {
    std::filesystem::remove("/proc/mounts");
    if (!mount_point.empty()) {
      const std::string line = "/dev/block/any " + mount_point + " ext4 rw 0 0\n";
      ASSERT_TRUE(android::base::WriteStringToFile(line, "/proc/mounts"));
    }
  }

  // As output_of, with the lines of the base log at their places as "E roots.cpp:122 text". The log
  // destroys `errno`.
  static std::string messages_of(const std::function<void()>& body) {
    android::base::SetLogger(
        [](auto, auto severity, auto, const char* file, unsigned int line, const char* text) {
          fprintf(stdout, "%c %s:%u %s\n", "VDIWEFF"[severity], file, line, text);
          errno = 0;
        });
    std::string messages = output_of(body);
    android::base::SetLogger(android::base::StderrLogger);
    return messages;
  }

  // Returns the calls so far and forgets them.
  Calls take_calls() { return std::exchange(platform_.calls, {}); }

  FakeDeviceMapper& device_mapper_ = FakeDeviceMapper::instance();

 private:
  std::optional<ScopedTmpfs> proc_;
};

}  // namespace sentrova::testing
