#pragma once

#include "cli/exit_status.h"
#include "cli/output.h"

namespace sentrova {

// `sentrova password-type`: prints the kind of credential that locks the data of `user_id`.
ExitStatus show_password_type(int user_id, const Output& output);

// `sentrova verify`: asks for a password and prints whether it is the credential of `user_id`.
ExitStatus verify_password(int user_id, const Output& output);

}  // namespace sentrova
