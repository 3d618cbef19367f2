#pragma once

#include <string>

namespace sentrova::fs_mgr {

// Has an unmounted ext4 or f2fs volume repaired by the device's own tool, as far as that can be
// done without asking, and waits for it. Does nothing for other types and without the tool. That
// the tool was not content is logged; the mount shows what the volume is worth.
void repair_file_system(const std::string& device, const std::string& fs_type);

}  // namespace sentrova::fs_mgr
