#pragma once

#include <string>

#include "cli/exit_status.h"
#include "cli/output.h"

namespace sentrova {

// `sentrova datadump ...`: the data-dump flags (datadump/datadump.h). All print the flags as they
// are then.
ExitStatus show_datadump(const Output& output);
ExitStatus enable_datadump(const Output& output);
ExitStatus disable_datadump(const Output& output);

// Sets the offset of an armed dump: a decimal number, or a hexadecimal one with "0x" before it.
ExitStatus resize_datadump(const std::string& offset, const Output& output);

}  // namespace sentrova
