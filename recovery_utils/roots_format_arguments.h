#pragma once

#include <fstab/fstab.h>
#include <stdint.h>

#include <string>
#include <vector>

#include "recovery_utils/roots_format_data.h"

// The command lines of the tools that make and fill file systems, program first.
namespace sentrova {

// All that is decided before the tools run.
struct FormatPlan {
  const android::fs_mgr::FstabEntry& row;
  FormatTarget target;
  bool needs_projid = false;    // room for project ids, for quotas by directory
  bool needs_casefold = false;  // names may be looked up whatever their case (f2fs)
  int64_t length = 0;           // bytes of the file system; 0: all of the device
};

std::vector<std::string> mke2fs_arguments(const FormatPlan& plan);
std::vector<std::string> make_f2fs_arguments(const FormatPlan& plan);

// These fill the new file system from `directory`.
std::vector<std::string> e2fsdroid_arguments(const FormatPlan& plan, const std::string& directory);
std::vector<std::string> sload_f2fs_arguments(const FormatPlan& plan, const std::string& directory);

}  // namespace sentrova
