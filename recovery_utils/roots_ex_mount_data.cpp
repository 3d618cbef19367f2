#include <errno.h>
#include <libdm/dm.h>
#include <stdio.h>
#include <string.h>
#include <sys/mount.h>
#include <unistd.h>

#include <string_view>

#include "common/log_at.h"
#include "recovery_utils/roots_ex_dm.h"
#include "recovery_utils/roots_ex_log.h"
#include "recovery_utils/roots_ex_mount.h"

using android::dm::DeviceMapper;
using android::dm::DmDeviceState;
using android::fs_mgr::FstabEntry;

namespace sentrova::roots_ex {
namespace {

constexpr int kMountAttempts = 2;
constexpr int kLooks = 25;
constexpr useconds_t kLookMicroseconds = 200'000;

void log_mapping(unsigned int line, android::base::LogSeverity severity, std::string_view text) {
  log_at({"recovery_utils/roots_ex.cpp", line}, severity, text);
}

// Returns the node of the data partition's device-mapper device, or where it is bound to appear.
std::string find_mapping() {
  DeviceMapper& mapper = DeviceMapper::Instance();
  std::string node;
  if (mapper.GetState(kUserdataMapping) == DmDeviceState::INVALID) {
    log_mapping(349, android::base::ERROR,
                std::string("zuno_ensure_path_mounted: DeviceMapper state INVALID for ") +
                    kUserdataMapping);
  } else {
    mapper.GetDmDevicePathByName(kUserdataMapping, &node);
    log_mapping(347, android::base::INFO,
                "zuno_ensure_path_mounted: userdata Dm device is " + node);
  }
  if (node.empty()) {
    node = kFirstMapping;
    log_mapping(354, android::base::ERROR,
                "zuno_ensure_path_mounted: usedata Dm device miss, force set /dev/block/dm-0");
  }
  return node;
}

// Gives up in silence: the mount then tells what is wrong.
void wait_for_node(const std::string& node) {
  for (int look = 0; look < kLooks; ++look) {
    if (access(node.c_str(), F_OK) == 0) {
      fprintf(stdout, "[%s]I: mounting data -> block device %s is exited !!!\n", kLogTag,
              node.c_str());
      return;
    }
    fprintf(stdout, "[%s]I: mounting data -> block device %s is not exited , wait 200 ms !!!\n",
            kLogTag, node.c_str());
    usleep(kLookMicroseconds);
  }
}

// A busy device is reported as a success but stays a failure, so that it is tried once more; both
// are relied upon.
int try_mount(const std::string& device, const FstabEntry& row) {
  const int result = mount(device.c_str(), row.mount_point.c_str(), row.fs_type.c_str(), row.flags,
                           row.fs_options.c_str());
  if (result == 0 || errno == EBUSY) {
    fprintf(stdout, "[%s]I: Success to mount /data at %s\n", kLogTag, device.c_str());
  } else {
    fprintf(stdout, "[%s]E: Fail to mount /data at %s (%s)\n", kLogTag, device.c_str(),
            strerror(errno));
  }
  return result;
}

}  // namespace

int mount_data(const FstabEntry& row) {
  const std::string mapping = data_is_mapped() ? find_mapping() : "";
  const std::string& device = mapping.empty() ? row.blk_device : mapping;
  int result = -1;
  for (int attempt = 0; attempt < kMountAttempts && result != 0; ++attempt) {
    if (!mapping.empty()) {
      wait_for_node(mapping);
    }
    result = try_mount(device, row);
  }
  return result;
}

}  // namespace sentrova::roots_ex
