#pragma once

#include <fstab/fstab.h>
#include <stdint.h>

#include <optional>

// What a format does to block devices itself, before a tool runs.
namespace sentrova {

// Wipes the whole of the row's key device, if it names one by path. A path that is absent becomes
// an empty file, and of a regular file nothing is wiped. False, after a message, if it cannot be
// opened.
bool wipe_key_device(const android::fs_mgr::FstabEntry& row);

// Returns the bytes that the row gives its file system: 0 for the whole device, else as many as the
// row says, or those that are left in front of the tail that it keeps free (its negative length, or
// the crypt footer where the key is there). Nothing, after a message, if the device cannot be
// opened or is no larger than the tail.
std::optional<int64_t> file_system_length(const android::fs_mgr::FstabEntry& row);

}  // namespace sentrova
