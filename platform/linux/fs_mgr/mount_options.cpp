#include "platform/linux/fs_mgr/mount_options.h"

#include <android-base/strings.h>
#include <sys/mount.h>

#include <algorithm>
#include <iterator>
#include <string_view>

namespace sentrova::fs_mgr {

namespace {

struct MountFlag {
  std::string_view name;
  unsigned long flag;
};

// From mount(8) and mount(2). "rw" and "defaults" say what is so without them.
constexpr MountFlag kMountFlags[] = {
    {"bind", MS_BIND},
    {"defaults", 0},
    {"dirsync", MS_DIRSYNC},
    {"lazytime", MS_LAZYTIME},
    {"noatime", MS_NOATIME},
    {"nodev", MS_NODEV},
    {"nodiratime", MS_NODIRATIME},
    {"noexec", MS_NOEXEC},
    {"nosuid", MS_NOSUID},
    {"private", MS_PRIVATE},
    {"rec", MS_REC},
    {"relatime", MS_RELATIME},
    {"remount", MS_REMOUNT},
    {"ro", MS_RDONLY},
    {"rw", 0},
    {"shared", MS_SHARED},
    {"slave", MS_SLAVE},
    {"strictatime", MS_STRICTATIME},
    {"sync", MS_SYNCHRONOUS},
    {"unbindable", MS_UNBINDABLE},
};

}  // namespace

void apply_mount_options(const std::string& text, android::fs_mgr::FstabEntry& entry) {
  for (const std::string& option : android::base::Split(text, ",")) {
    const auto* const known =
        std::find_if(std::begin(kMountFlags), std::end(kMountFlags),
                     [&option](const MountFlag& row) { return row.name == option; });
    if (known != std::end(kMountFlags)) {
      entry.flags |= known->flag;
    } else if (!option.empty()) {
      entry.fs_options += (entry.fs_options.empty() ? "" : ",") + option;
    }
  }
}

}  // namespace sentrova::fs_mgr
