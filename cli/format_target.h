#pragma once

#include <fstab/fstab.h>

#include <string>

namespace sentrova {

// Returns, in words, why the row's volume cannot be formatted, or an empty text: its file system is
// one that is not made, the device runs from it, its device is not there or is mounted elsewhere
// too, this process holds it, or `directory` (if not empty) is none or lies on the volume itself.
std::string find_format_obstacle(const android::fs_mgr::FstabEntry& row,
                                 const std::string& directory);

// What formatting does to the device and what is lost, in lines for a person.
std::string describe_format(const android::fs_mgr::FstabEntry& row, const std::string& directory);

}  // namespace sentrova
