#pragma once

#include "cli/exit_status.h"
#include "cli/output.h"

namespace sentrova {

// `sentrova status`: prints what credential locks the data of `user_id`, how the data is encrypted,
// how the last unlock ended and what is mounted at /data. What does not need the service is printed
// without it too.
ExitStatus show_status(int user_id, const Output& output);

}  // namespace sentrova
