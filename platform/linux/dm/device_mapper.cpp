#include <android-base/logging.h>
#include <libdm/dm.h>
#include <unistd.h>

#include <cerrno>
#include <optional>
#include <thread>

#include "platform/linux/dm/dm_task.h"

namespace android::dm {

using sentrova::dm::DmTask;
using sentrova::dm::LibraryTurn;

namespace {

constexpr std::chrono::milliseconds kNodeWaitStep(10);

bool request(int type, const std::string& name) {
  return DmTask(type, name).run();
}

// A device that is not there has info too, which says so.
std::optional<dm_info> query(const std::string& name) {
  const LibraryTurn turn;
  DmTask task(DM_DEVICE_INFO, name);
  if (!task.run()) {
    return std::nullopt;
  }
  return task.info();
}

bool load_table(const std::string& name, const DmTable& table) {
  DmTask task(DM_DEVICE_RELOAD, name);
  return task.set_table(table) && task.run();
}

bool wait_for_node(const std::string& path, std::chrono::milliseconds timeout) {
  const auto end = std::chrono::steady_clock::now() + timeout;
  while (access(path.c_str(), F_OK) != 0) {
    if (std::chrono::steady_clock::now() >= end) {
      errno = ETIMEDOUT;
      return false;
    }
    std::this_thread::sleep_for(kNodeWaitStep);
  }
  return true;
}

}  // namespace

DeviceMapper& DeviceMapper::Instance() {
  static DeviceMapper* const instance = new DeviceMapper;
  return *instance;
}

DmDeviceState DeviceMapper::GetState(const std::string& name) const {
  const std::optional<dm_info> info = query(name);
  if (!info || info->exists == 0) {
    return DmDeviceState::INVALID;
  }
  // A device without a live table is not to be read from either.
  return info->suspended != 0 || info->live_table == 0 ? DmDeviceState::SUSPENDED
                                                       : DmDeviceState::ACTIVE;
}

bool DeviceMapper::GetDmDevicePathByName(const std::string& name, std::string* path) {
  const std::optional<dm_info> info = query(name);
  if (!info) {
    return false;
  }
  if (info->exists == 0) {
    LOG(WARNING) << "no device-mapper device " << name;
    errno = ENXIO;
    return false;
  }
  *path = "/dev/block/dm-" + std::to_string(info->minor);
  return true;
}

// Three requests, because the library's one request for all of it loses the kernel's reason.
bool DeviceMapper::CreateDevice(const std::string& name, const DmTable& table) {
  if (!table.valid()) {
    LOG(ERROR) << "unusable table for device-mapper device " << name;
    errno = EINVAL;
    return false;
  }
  const LibraryTurn turn;
  if (!request(DM_DEVICE_CREATE, name)) {
    return false;
  }
  if (load_table(name, table) && request(DM_DEVICE_RESUME, name)) {
    return true;
  }
  const int error = errno;
  request(DM_DEVICE_REMOVE, name);
  errno = error;
  return false;
}

bool DeviceMapper::CreateDevice(const std::string& name, const DmTable& table, std::string* path,
                                const std::chrono::milliseconds& timeout) {
  if (!CreateDevice(name, table)) {
    return false;
  }
  std::string node;
  if (GetDmDevicePathByName(name, &node) && wait_for_node(node, timeout)) {
    *path = std::move(node);
    return true;
  }
  const int error = errno;
  PLOG(ERROR) << "no node for device-mapper device " << name;
  DeleteDevice(name);
  errno = error;
  return false;
}

bool DeviceMapper::DeleteDevice(const std::string& name) {
  const LibraryTurn turn;
  return request(DM_DEVICE_REMOVE, name);
}

bool DeviceMapper::DeleteDeviceIfExists(const std::string& name) {
  const std::optional<dm_info> info = query(name);
  if (!info) {
    return errno == ENODEV;
  }
  return info->exists == 0 || DeleteDevice(name);
}

}  // namespace android::dm
