#pragma once

#include <string>

#include "cli/exit_status.h"
#include "cli/output.h"

namespace sentrova {

// The values of `sentrova unlock --method`.
inline constexpr char kMethodAuto[] = "auto";
inline constexpr char kMethodFileBased[] = "fbe";
inline constexpr char kMethodFullDisk[] = "fde";

// `sentrova unlock`: unlocks the data of `user_id` step by step, asking for a password where one is
// needed (up to three times on a terminal), and prints each step, its time and what is readable.
ExitStatus unlock_data(int user_id, const std::string& method, const Output& output);

}  // namespace sentrova
