#pragma once

#include "cli/exit_status.h"
#include "cli/output.h"

namespace sentrova {

// `sentrova volumes`: prints the volume table, what is mounted of it and how full that is.
ExitStatus list_volumes(const Output& output);

}  // namespace sentrova
