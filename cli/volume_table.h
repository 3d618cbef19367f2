#pragma once

#include "cli/output.h"

namespace sentrova {

// Loads the volume table (recovery_utils/roots.h) into this process, with the library's messages on
// standard error. Loading mounts /data; where it was not mounted before, it is unmounted again, so
// that looking at the table leaves the device as it is. Returns false after an error if the device
// has no table.
bool load_volumes(const Output& output);

// Says so where this process is not root's, which all but looking takes.
void note_unless_root(const Output& output);

// The absolute path without "." and "..", doubled slashes or one at its end, as the table takes it;
// empty if `path` is not absolute.
std::string table_path(const std::string& path);

}  // namespace sentrova
