#include <android-base/properties.h>
#include <fs_mgr/roots.h>
#include <time.h>

#include <optional>
#include <utility>

#include "datadump/datadump.h"
#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "recovery_utils/roots_format_arguments.h"
#include "recovery_utils/roots_format_data.h"
#include "recovery_utils/roots_format_device.h"
#include "recovery_utils/roots_format_log.h"
#include "recovery_utils/roots_format_tools.h"
#include "recovery_utils/volume_table.h"

using android::base::GetBoolProperty;
using android::fs_mgr::FstabEntry;
namespace format_log = sentrova::format_log;

namespace {

constexpr char kData[] = "/data";

// Returns the row to format, whose volume is then unmounted, or null after a message.
const FstabEntry* take_volume(const std::string& volume) {
  const FstabEntry* row = android::fs_mgr::GetEntryForPath(&sentrova::volume_table(), volume);
  if (row == nullptr) {
    format_log::error(242, "unknown volume \"" + volume + "\"");
  } else if (row->fs_type == "ramdisk") {
    format_log::error(246, "can't format_volume \"" + volume + "\"");
  } else if (row->mount_point != volume) {
    format_log::error(250, "can't give path \"" + volume + "\" to format_volume");
  } else if (ensure_path_unmounted(volume, true) != 0) {
    format_log::error(254, "format_volume: Failed to unmount \"" + row->mount_point + "\"");
  } else if (row->fs_type != "ext4" && row->fs_type != "f2fs") {
    format_log::error(258, "format_volume: fs_type \"" + row->fs_type + "\" unsupported");
  } else {
    return row;
  }
  return nullptr;
}

// Decides what the tools are to do and wipes the key. Nothing after a message.
std::optional<sentrova::FormatPlan> prepare(const FstabEntry& row, bool& revert_userdata) {
  sentrova::FormatPlan plan{.row = row, .target = {.device = row.blk_device}};
  if (row.mount_point == kData) {
    plan.needs_casefold = GetBoolProperty("external_storage.casefold.enabled", false);
    plan.needs_projid = GetBoolProperty("external_storage.projid.enabled", false);
    plan.target = sentrova::choose_data_target(row, revert_userdata);
  }
  if (plan.target.wipe_key && !sentrova::wipe_key_device(row)) {
    return std::nullopt;
  }
  const std::optional<int64_t> length = sentrova::file_system_length(row);
  if (!length) {
    return std::nullopt;
  }
  plan.length = *length;
  return plan;
}

// The positions of the lines that end a format; they tell which kind it was.
struct EndLines {
  unsigned int end;
  unsigned int clearing;
  unsigned int not_cleared;
};
constexpr EndLines kExt4Lines = {417, 419, 421};
constexpr EndLines kF2fsLines = {472, 474, 476};

// The volume is formatted by now, whatever becomes of the dump's offset.
void finish(const std::string& volume, time_t start, bool dump_enabled, const EndLines& lines) {
  const time_t end = time(nullptr);
  format_log::info(lines.end, "Formating " + volume + ", end=" + std::to_string(end) +
                                  ", duration=" + std::to_string(end - start));
  if (!dump_enabled) {
    return;
  }
  format_log::system_error(lines.clearing, "will to clear datadump offset flag");
  if (datadump_resize(0) < 0) {
    format_log::system_error(lines.not_cleared, "clear datadump offset flag failed...");
  }
}

}  // namespace

int format_volume(const std::string& volume, const std::string& directory, bool& revert_userdata) {
  const time_t start = time(nullptr);
  format_log::info(238, "Formating " + volume + ", start= " + std::to_string(start));
  const FstabEntry* row = take_volume(volume);
  if (row == nullptr) {
    return -1;
  }
  const std::optional<sentrova::FormatPlan> plan = prepare(*row, revert_userdata);
  if (!plan) {
    return -1;
  }
  const bool is_ext4 = row->fs_type == "ext4";
  if (!(is_ext4 ? sentrova::make_ext4 : sentrova::make_f2fs)(*plan, directory)) {
    return -1;
  }
  finish(volume, start, plan->target.dump_enabled, is_ext4 ? kExt4Lines : kF2fsLines);
  return 0;
}

int format_volume(const std::string& volume) {
  bool revert_userdata = false;
  return format_volume(volume, "", revert_userdata);
}

int format_volume(const std::string& volume, bool& revert_userdata) {
  return format_volume(volume, "", revert_userdata);
}

int format_volume(const std::string& volume, const std::string& directory) {
  bool revert_userdata = false;
  return format_volume(volume, directory, revert_userdata);
}
