#pragma once

#include <chrono>
#include <string>

#include "common/export.h"
#include "libdm/dm_table.h"

namespace android::dm {

enum class DmDeviceState {
  // There is no such device, or the kernel could not be asked.
  INVALID,
  SUSPENDED,
  ACTIVE,
};

// The kernel's device mapper. Devices are known by name; their nodes are /dev/block/dm-N. Nothing
// is kept in the process, so that devices which other programs make and remove are seen as they
// are. Every failure leaves `errno` and a line in the base log. All threads, one call at a time: a
// call waits for the one before.
class SENTROVA_API DeviceMapper {
 public:
  // The one object; it holds nothing and is never destroyed.
  static DeviceMapper& Instance();

  DmDeviceState GetState(const std::string& name) const;

  // Sets *path to the device's node, /dev/block/dm-N. False, with *path as it was, when there is no
  // such device (`errno` ENXIO) or the kernel could not be asked. The node itself is not looked
  // for.
  bool GetDmDevicePathByName(const std::string& name, std::string* path);

  // Makes a device and sets it going. True when it is ACTIVE. False with the kernel's reason and
  // nothing left behind: EBUSY for a name that is taken, EINVAL for a table or a name that will not
  // do. The node may appear a moment later.
  bool CreateDevice(const std::string& name, const DmTable& table);

  // As above, then waits for the node until `timeout` has passed. True with *path set when the node
  // is there; else false, ETIMEDOUT if it did not appear, and the device is removed again.
  bool CreateDevice(const std::string& name, const DmTable& table, std::string* path,
                    const std::chrono::milliseconds& timeout);

  // Removes a device. False with `errno` EBUSY while it is open or mounted, ENXIO if there is none.
  bool DeleteDevice(const std::string& name);

  // As DeleteDevice, and true where there is no such device or no device mapper at all. False as
  // well when the kernel could not be asked whether there is.
  bool DeleteDeviceIfExists(const std::string& name);

 private:
  DeviceMapper() = default;
};

}  // namespace android::dm
