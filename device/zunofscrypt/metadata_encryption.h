#pragma once

#include <fstab/fstab.h>

#include <string>

#include "device/zunofscrypt/places.h"

namespace sentrova {

// The wrapped key of metadata encryption, in the folder that the row of the user data names
// ("keydirectory=").
std::string metadata_key_path(const android::fs_mgr::FstabEntry& data_row);

// Makes the dm-crypt device over the row's partition and mounts it at `places.data`, with the row's
// type and options; the partition itself cannot be mounted. What of this is done already is left
// alone. Returns false, with the reason in `error`, where it cannot be done; a device that was made
// is then removed again.
bool unlock_metadata(const Places& places, const android::fs_mgr::FstabEntry& data_row,
                     std::string& error);

}  // namespace sentrova
