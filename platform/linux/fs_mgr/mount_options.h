#pragma once

#include <fstab/fstab.h>

#include <string>

namespace sentrova::fs_mgr {

// Puts the fourth field of an fstab line into entry.flags (options that are flags of mount(2)) and
// entry.fs_options (all others, for the file system to judge). Nothing is out of form here.
void apply_mount_options(const std::string& text, android::fs_mgr::FstabEntry& entry);

}  // namespace sentrova::fs_mgr
