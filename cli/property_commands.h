#pragma once

#include "cli/output.h"

namespace CLI {
class App;
}

namespace sentrova {

// Adds `sentrova properties` with its verbs, which call the volume layer
// (recovery_utils/roots_ex.h) in this process: on a rescue device, as root, with its property
// loader running. They mount /cache for the backups if they can. Verbs that load end with
// kExitAnswerIsNo where what they load (of the vendor's properties, the oem ones) is not ready
// then. When one is given, `status` becomes its exit status. Both objects must outlive the parsing.
void add_property_commands(CLI::App& app, const Output& output, int& status);

}  // namespace sentrova
