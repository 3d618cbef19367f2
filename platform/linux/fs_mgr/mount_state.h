#pragma once

#include <string>

namespace sentrova::fs_mgr {

enum class MountState { kMounted, kNotMounted, kUnknown };

// Whether something is mounted at exactly this path in the caller's mount namespace. kUnknown, with
// `errno`, when the kernel's mount table cannot be read. All threads.
MountState mount_state(const std::string& mount_point);

}  // namespace sentrova::fs_mgr
