#pragma once

#include <libdm/dm.h>

#include <functional>
#include <string>

// Takes the place of what android::dm::DeviceMapper asks the kernel: answers as it is told and
// remembers in FakeFsMgr's calls what it was asked: "dm state userdata", "dm path userdata", "dm
// delete userdata". Devices are not made. One script for the whole process; for tests on one
// thread.
struct FakeDeviceMapper {
  std::function<android::dm::DmDeviceState(const std::string& name)> state = [](const auto&) {
    return android::dm::DmDeviceState::INVALID;
  };
  // The node of a device, "" where there is none.
  std::function<std::string(const std::string& name)> node = [](const auto&) { return ""; };
  // The `errno` that the removal of a device fails with, or 0 for success.
  std::function<int(const std::string& name)> delete_error = [](const auto&) { return 0; };

  static FakeDeviceMapper& instance();
  void reset() { *this = FakeDeviceMapper(); }
};
