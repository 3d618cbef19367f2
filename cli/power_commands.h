#pragma once

#include "cli/output.h"

namespace CLI {
class App;
}

namespace sentrova {

// Adds `reboot [REASON]`, which ends with the device and prints nothing but an error, and `shutdown
// [REASON]`, which returns once the request stands. `output` and `status` must outlive the parsing;
// `status` gets the exit status.
void add_power_commands(CLI::App& app, const Output& output, int& status);

}  // namespace sentrova
