#pragma once

#include <string>

#include "recovery_utils/roots_format_arguments.h"

// Running the tools, one after the other, each to its end. A tool that fails ends it with messages
// and false; what it left on the device stays.
namespace sentrova {

// Makes the file system and, if `directory` is not empty, fills it from there.
bool make_ext4(const FormatPlan& plan, const std::string& directory);
bool make_f2fs(const FormatPlan& plan, const std::string& directory);

}  // namespace sentrova
