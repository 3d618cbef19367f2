#include "cli/mount_commands.h"

#include <nlohmann/json.hpp>

#include "cli/holders.h"
#include "cli/library_messages.h"
#include "cli/mounts.h"
#include "cli/progress.h"
#include "cli/volume_table.h"
#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"

namespace sentrova {
namespace {

using android::fs_mgr::FstabEntry;

constexpr char kListHint[] = "; `sentrova volumes` lists them";

// The row for "/" would serve every path that is in no other.
const FstabEntry* find_served_row(const std::string& path) {
  const FstabEntry* row = zuno_volume_for_path(path);
  return row != nullptr && row->mount_point == "/" && path != "/" ? nullptr : row;
}

std::string describe(const Mount& mount) {
  return mount.file_system + " on " + mount.device;
}

ExitStatus show_mounted(const FstabEntry& row, bool was_mounted, const Output& output) {
  const std::optional<Mount> mount = find_mount(row.mount_point);
  output.result(!mount        ? row.mount_point + " needs no mounting: " + row.fs_type
                : was_mounted ? row.mount_point + " was mounted before: " + describe(*mount)
                              : row.mount_point + " is mounted: " + describe(*mount),
                {{"mount_point", row.mount_point},
                 {"was_mounted", was_mounted},
                 {"mounted", mount_as_json(mount)}});
  return kExitSuccess;
}

int mount_row(const FstabEntry& row, const std::string& path) {
  const LibraryMessagesToStderr messages;
  const Progress progress(row.mount_point == "/otg" ? "waiting for a USB disk"
                                                    : "mounting " + row.mount_point);
  return ensure_path_mounted(path);
}

std::string describe_holders(const std::string& mount_point) {
  const size_t count = find_holders(mount_point).holders.size();
  return count == 0 ? "; the messages tell why"
                    : "; processes that hold it: " + std::to_string(count) +
                          " (`sentrova holders " + mount_point + "` lists them)";
}

ExitStatus show_unmounted(const std::string& mount_point, bool succeeded, const Output& output) {
  const std::optional<Mount> mount = find_mount(mount_point);
  const nlohmann::json object = {{"mount_point", mount_point}, {"mounted", mount_as_json(mount)}};
  if (!mount) {
    output.result(mount_point + " is unmounted", object);
    return kExitSuccess;
  }
  output.error(
      succeeded ? mount_point + " was mounted more than once, and this is left: " + describe(*mount)
                : "cannot unmount " + mount_point + describe_holders(mount_point),
      object);
  return kExitServiceFailed;
}

}  // namespace

ExitStatus mount_volume(const std::string& path, const Output& output) {
  const std::string clean = table_path(path);
  if (clean.empty()) {
    output.error("the path must begin with /");
    return kExitUsage;
  }
  if (!load_volumes(output)) {
    return kExitServiceFailed;
  }
  const FstabEntry* found = find_served_row(clean);
  if (found == nullptr) {
    output.error("no volume of this device holds " + clean + kListHint);
    return kExitUsage;
  }
  const FstabEntry row = *found;
  const bool was_mounted = find_mount(row.mount_point).has_value();
  if (mount_row(row, clean) != 0) {
    output.error("cannot mount " + row.mount_point + " from " + row.blk_device +
                 "; the messages tell why");
    return kExitServiceFailed;
  }
  return show_mounted(row, was_mounted, output);
}

ExitStatus unmount_volume(const std::string& path, bool force, const Output& output) {
  const std::string mount_point = table_path(path);
  if (mount_point.empty() || mount_point == "/") {
    output.error(mount_point.empty() ? "the path must begin with /"
                                     : "/ is what this device runs from");
    return kExitUsage;
  }
  if (!load_volumes(output)) {
    return kExitServiceFailed;
  }
  if (volume_for_mount_point(mount_point) == nullptr) {
    output.error("no volume of this device is mounted at " + mount_point + kListHint);
    return kExitUsage;
  }
  if (!find_mount(mount_point)) {
    output.result("nothing is mounted at " + mount_point,
                  {{"mount_point", mount_point}, {"mounted", nullptr}});
    return kExitSuccess;
  }
  // By force all others would be ended first, the caller's shell too, and in vain.
  if (const std::string hold = find_own_hold(mount_point); !hold.empty()) {
    output.error(hold);
    return kExitUsage;
  }
  int result = 0;
  {
    const LibraryMessagesToStderr messages;
    const Progress progress("unmounting " + mount_point);
    result = ensure_path_unmounted(mount_point, force);
  }
  return show_unmounted(mount_point, result == 0, output);
}

}  // namespace sentrova
