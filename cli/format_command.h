#pragma once

#include <string>

#include "cli/exit_status.h"
#include "cli/output.h"

namespace sentrova {

// `sentrova format`: makes a fresh file system on the volume whose mount point is `volume`, filled
// from `directory` if that is not empty. Says on standard error what will be lost; then, unless
// `is_confirmed`, a person at the terminal must type "yes" (kExitAnswerIsNo for anything else).
// Where nobody can be asked it refuses. What can be found wrong is found before anything changes.
ExitStatus format_volume_of_table(const std::string& volume, const std::string& directory,
                                  bool is_confirmed, const Output& output);

}  // namespace sentrova
