#pragma once

#include "cli/exit_status.h"
#include "cli/output.h"

namespace sentrova {

// These call the volume layer (recovery_utils/roots_ex.h) in this process: on a rescue device, as
// root, with its property loader running. They mount /cache for the backups if they can.

// `sentrova properties load`: loads the vendor's properties, or their backups, and prints which are
// ready. Status kExitAnswerIsNo where the oem properties are not.
ExitStatus load_properties(const Output& output);

// `sentrova properties backup`: backs up the files of properties that are ready, else loads the
// backups; prints and answers as above.
ExitStatus back_up_properties(const Output& output);

// `sentrova properties clear`: removes the backups.
ExitStatus clear_property_backups(const Output& output);

// `sentrova properties persist`: loads the persistent properties from the data partition. Status
// kExitAnswerIsNo where they are not to be had.
ExitStatus load_persistent_properties(const Output& output);

}  // namespace sentrova
