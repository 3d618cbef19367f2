#pragma once

#include <fstab/fstab.h>

#include <string>

namespace sentrova::fs_mgr {

// Puts the fifth field of an fstab line into the entry. Returns an empty text, or what is wrong
// with the field: the first option whose value is missing or out of its form or range. The entry is
// then half filled. Options that are not known are added to `unknown`, with commas between them.
std::string apply_fs_mgr_options(const std::string& text, android::fs_mgr::FstabEntry& entry,
                                 std::string& unknown);

}  // namespace sentrova::fs_mgr
