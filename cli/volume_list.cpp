#include "cli/volume_list.h"

#include <nlohmann/json.hpp>

#include "cli/mounts.h"
#include "cli/volume_table.h"
#include "recovery_utils/roots.h"

namespace sentrova {
namespace {

using android::fs_mgr::FstabEntry;

constexpr char kNone[] = "-";

std::string size_cell(uint64_t bytes, bool for_people) {
  return for_people ? human_size(bytes) : std::to_string(bytes);
}

// Of what is mounted, the device is told only where it is not the row's.
std::vector<std::string> cells(const FstabEntry& row, const std::optional<Mount>& mount,
                               const FileSystemUse& use, bool for_people) {
  const std::string device = row.blk_device.empty() ? kNone : row.blk_device;
  std::vector<std::string> result = {row.mount_point, mount ? mount->file_system : row.fs_type,
                                     device,
                                     !mount                            ? kNone
                                     : mount->device == row.blk_device ? "yes"
                                                                       : mount->device};
  if (use.size > 0) {
    for (const uint64_t bytes : {use.size, use.used, use.available}) {
      result.push_back(size_cell(bytes, for_people));
    }
  } else {
    result.insert(result.end(), 3, kNone);
  }
  return result;
}

nlohmann::json describe(const FstabEntry& row, const std::optional<Mount>& mount,
                        const FileSystemUse& use) {
  nlohmann::json mounted = mount_as_json(mount);
  if (use.size > 0) {
    mounted["size"] = use.size;
    mounted["used"] = use.used;
    mounted["available"] = use.available;
  }
  return {{"mount_point", row.mount_point},
          {"file_system", row.fs_type},
          {"device", row.blk_device.empty() ? nlohmann::json() : nlohmann::json(row.blk_device)},
          {"mounted", mounted}};
}

}  // namespace

ExitStatus list_volumes(const Output& output) {
  if (!load_volumes(output)) {
    return kExitServiceFailed;
  }
  const std::vector<Mount> mounts = read_mounts();
  Table table({"VOLUME", "TYPE", "DEVICE", "MOUNTED", "SIZE", "USED", "FREE"});
  nlohmann::json volumes = nlohmann::json::array();
  for (const FstabEntry& row : get_fstab_default()) {
    const std::optional<Mount> mount = find_mount(mounts, row.mount_point);
    const FileSystemUse use = mount ? read_use(row.mount_point) : FileSystemUse();
    table.add_row(cells(row, mount, use, output.to_terminal()));
    volumes.push_back(describe(row, mount, use));
  }
  output.result(table, {{"volumes", volumes}});
  return kExitSuccess;
}

}  // namespace sentrova
