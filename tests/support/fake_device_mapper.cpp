#include "tests/support/fake_device_mapper.h"

#include <errno.h>

#include "tests/support/fake_fs_mgr.h"

FakeDeviceMapper& FakeDeviceMapper::instance() {
  static FakeDeviceMapper mapper;
  return mapper;
}

namespace android::dm {

DeviceMapper& DeviceMapper::Instance() {
  static DeviceMapper mapper;
  return mapper;
}

DmDeviceState DeviceMapper::GetState(const std::string& name) const {
  FakeFsMgr::instance().calls.push_back("dm state " + name);
  return FakeDeviceMapper::instance().state(name);
}

bool DeviceMapper::GetDmDevicePathByName(const std::string& name, std::string* path) {
  FakeFsMgr::instance().calls.push_back("dm path " + name);
  const std::string node = FakeDeviceMapper::instance().node(name);
  if (node.empty()) {
    errno = ENXIO;
    return false;
  }
  *path = node;
  return true;
}

bool DeviceMapper::DeleteDeviceIfExists(const std::string& name) {
  FakeFsMgr::instance().calls.push_back("dm delete " + name);
  const int error = FakeDeviceMapper::instance().delete_error(name);
  if (error != 0) {
    errno = error;
  }
  return error == 0;
}

}  // namespace android::dm
