#pragma once

#include <string>
#include <vector>

namespace sentrova::roots_ex {

// Removable disks under the names that the kernel gives them.
inline constexpr char kOtgDevice[] = "/dev/block/sda1";
inline constexpr char kOtgDisk[] = "/dev/block/sda";
inline constexpr char kOtgDeviceUfs[] = "/dev/block/sdg1";  // UFS storage takes sda to sdf
inline constexpr char kOtgDiskUfs[] = "/dev/block/sdg";
inline constexpr char kSdcardPartition[] = "/dev/block/mmcblk1p1";
inline constexpr char kSdcardDisk[] = "/dev/block/mmcblk1";
inline constexpr char kSdcardPartitionUfs[] = "/dev/block/mmcblk0p1";

// Returns whether the device's own storage is UFS, which shifts the names of removable disks.
bool has_ufs_storage();

// Where a USB disk may show up, in the order in which the places are tried.
struct OtgDevices {
  std::vector<std::string> ufs = {kOtgDeviceUfs, kOtgDiskUfs};
  std::vector<std::string> non_ufs = {kOtgDevice, kOtgDisk};
  const std::vector<std::string> extra = {"/dev/block/sdd1", "/dev/block/sdd"};

  // Returns the list for this device's storage.
  const std::vector<std::string>& current() const { return has_ufs_storage() ? ufs : non_ufs; }
};

// Returns the process's one set of lists. zuno_enable_otg_device makes the UFS list longer;
// mounting by the vendor path sees that. Not locked.
OtgDevices& otg_devices();

}  // namespace sentrova::roots_ex
