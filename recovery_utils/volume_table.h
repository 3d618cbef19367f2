#pragma once

#include <fstab/fstab.h>

namespace sentrova {

// Returns the process's one volume table; see recovery_utils/roots.h. For the units of the volume
// layer, under the same rules.
android::fs_mgr::Fstab& volume_table();

}  // namespace sentrova
