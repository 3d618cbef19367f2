#include "recovery_utils/roots_format_data.h"

#include <android-base/properties.h>
#include <libdm/dm.h>
#include <unistd.h>

#include "datadump/datadump.h"
#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_ex_dm.h"
#include "recovery_utils/roots_format_log.h"

using android::base::GetBoolProperty;
using android::dm::DeviceMapper;
using android::dm::DmDeviceState;
using sentrova::roots_ex::kFirstMapping;
using sentrova::roots_ex::kUserdataMapping;

namespace sentrova {
namespace {

bool is_dump_enabled() {
  const int status = datadump_get_status();
  format_log::info(280, "datadump status =" + std::to_string(status));
  const bool enabled = status == 1 || status == 2;
  format_log::info(287, "userdata partition reserved dump enable=" + std::to_string(enabled));
  return enabled;
}

// Empty if there is no such device.
std::string mapped_device() {
  DeviceMapper& mapper = DeviceMapper::Instance();
  if (mapper.GetState(kUserdataMapping) == DmDeviceState::INVALID) {
    format_log::error(
        310, std::string("format_volume: DeviceMapper state INVALID for ") + kUserdataMapping);
    return "";
  }
  std::string path;
  mapper.GetDmDevicePathByName(kUserdataMapping, &path);
  format_log::info(304, "format_volume: userdata Dm device is " + path);
  if (path.empty()) {
    path = kFirstMapping;
    format_log::error(307, "format_volume: usedata Dm device miss, force set /dev/block/dm-0");
  }
  return path;
}

void revert_mapping(const std::string& path) {
  const bool reverted = volume_revert_dm_device(kUserdataMapping);
  format_log::info(328, "cryptfs revert userdata volume extend volume " + path +
                            (reverted ? " SUCCESS" : " FAIL"));
}

// Formats in place, or takes the mapping down.
void settle_mapping(FormatTarget& target, bool& revert_userdata) {
  const std::string path = mapped_device();
  if (!revert_userdata) {
    if (access(path.c_str(), F_OK) == 0) {
      target.device = path;
      target.wipe_key = false;
      return;
    }
    revert_userdata = true;
    format_log::info(320, path + " isn't exited, force revert userdata volume extend volume ");
  }
  revert_mapping(path);
}

}  // namespace

FormatTarget choose_data_target(const android::fs_mgr::FstabEntry& row, bool& revert_userdata) {
  FormatTarget target{.device = row.blk_device, .dump_enabled = is_dump_enabled()};
  if (roots_ex::data_is_mapped()) {
    if (target.dump_enabled || GetBoolProperty("ro.crypto.metadata.enabled", false)) {
      revert_userdata = true;
      format_log::info(
          296,
          "datadump or metadata encrypt is enable, force revert userdata volume extend volume ");
    }
    settle_mapping(target, revert_userdata);
  }
  format_log::info(331, "format_volume: will do format data volume " + target.device);
  return target;
}

}  // namespace sentrova
