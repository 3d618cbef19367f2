#pragma once

#include "cli/output.h"

namespace CLI {
class App;
}

namespace sentrova {

// Adds the verbs that call the library's volume layer in this process, on a rescue device, as root:
// volumes, mount, unmount, holders, format, find, otg, sdcard and datadump. When one is given,
// `status` becomes its exit status. Both objects must outlive the parsing.
void add_volume_commands(CLI::App& app, const Output& output, int& status);

}  // namespace sentrova
