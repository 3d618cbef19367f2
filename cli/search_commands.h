#pragma once

#include <string>

#include "cli/exit_status.h"
#include "cli/output.h"

namespace sentrova {

// These print what they find; status kExitAnswerIsNo where it is not to be found.

// `sentrova find`: the path of the first file of that name in the directory or below it.
ExitStatus find_file(const std::string& name, const std::string& directory, const Output& output);

// `sentrova otg`: switches the USB port to host mode and waits for a disk, up to a minute.
ExitStatus find_otg_disk(const Output& output);

// `sentrova sdcard`: the SD card's block device.
ExitStatus find_sd_card(const Output& output);

}  // namespace sentrova
