#include "recovery_utils/roots_format_arguments.h"

#include <algorithm>
#include <initializer_list>

using android::fs_mgr::FstabEntry;

namespace sentrova {
namespace {

using Arguments = std::vector<std::string>;

constexpr int64_t kBlockBytes = 4096;  // of ext4, and the sector unit of f2fs
constexpr int64_t kMinimumStrideBytes = 8192;
// 8 GiB whatever the size of the partition: what follows is the dump area.
constexpr char kBlocksBesideDump[] = "2097152";

void append(Arguments& arguments, std::initializer_list<const char*> more) {
  arguments.insert(arguments.end(), more.begin(), more.end());
}

void append_raid_geometry(Arguments& arguments, const FstabEntry& row) {
  if (row.logical_blk_size == 0 || row.erase_blk_size == 0) {
    return;
  }
  const int64_t stride = std::max<int64_t>(row.logical_blk_size, kMinimumStrideBytes) / kBlockBytes;
  const int64_t stripe_width = row.erase_blk_size / kBlockBytes;
  arguments.push_back("-E");
  arguments.push_back("stride=" + std::to_string(stride) +
                      ",stripe-width=" + std::to_string(stripe_width));
}

// The device, and the number of its blocks where the tool is not to take all of it.
void append_extent(Arguments& arguments, const FormatPlan& plan, int64_t minimum_length) {
  arguments.push_back(plan.target.device);
  if (plan.target.dump_enabled) {
    arguments.push_back(kBlocksBesideDump);
  } else if (plan.length >= minimum_length) {
    arguments.push_back(std::to_string(plan.length / kBlockBytes));
  }
}

}  // namespace

Arguments mke2fs_arguments(const FormatPlan& plan) {
  Arguments arguments{"/system/bin/mke2fs", "-F", "-t", "ext4", "-b", std::to_string(kBlockBytes)};
  if (plan.needs_projid) {
    append(arguments, {"-I", "512"});
  }
  if (plan.row.fs_mgr_flags.ext_meta_csum) {
    append(arguments, {"-O", "metadata_csum", "-O", "64bit", "-O", "extent"});
  }
  append_raid_geometry(arguments, plan.row);
  append_extent(arguments, plan, 1);
  return arguments;
}

Arguments make_f2fs_arguments(const FormatPlan& plan) {
  Arguments arguments{"/system/bin/make_f2fs", "-g", "android"};
  if (plan.needs_projid) {
    append(arguments, {"-O", "project_quota,extra_attr"});
  }
  if (plan.needs_casefold) {
    append(arguments, {"-O", "casefold", "-C", "utf8"});
  }
  if (plan.row.fs_mgr_flags.fs_compress) {
    append(arguments, {"-O", "compression", "-O", "extra_attr"});
  }
  append_extent(arguments, plan, kBlockBytes);
  return arguments;
}

Arguments e2fsdroid_arguments(const FormatPlan& plan, const std::string& directory) {
  return {"/system/bin/e2fsdroid", "-e", "-f", directory, "-a", plan.row.mount_point,
          plan.target.device};
}

Arguments sload_f2fs_arguments(const FormatPlan& plan, const std::string& directory) {
  return {"/system/bin/sload_f2fs", "-f", directory, "-t", plan.row.mount_point,
          plan.target.device};
}

}  // namespace sentrova
