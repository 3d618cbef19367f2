#pragma once

#include <string>

#include "cli/exit_status.h"
#include "cli/output.h"

namespace sentrova {

// `sentrova holders`: prints which processes hold `path` or something below it, and by what. Status
// kExitAnswerIsNo where none does.
ExitStatus show_holders(const std::string& path, const Output& output);

}  // namespace sentrova
