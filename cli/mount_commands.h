#pragma once

#include <string>

#include "cli/exit_status.h"
#include "cli/output.h"

namespace sentrova {

// `sentrova mount`: mounts the volume of the table that serves `path` and prints what is mounted.
ExitStatus mount_volume(const std::string& path, const Output& output);

// `sentrova unmount`: unmounts the volume whose mount point is `path`, but for "/". With `force`
// the processes that hold it are ended if need be. One that is not mounted counts as unmounted.
ExitStatus unmount_volume(const std::string& path, bool force, const Output& output);

}  // namespace sentrova
