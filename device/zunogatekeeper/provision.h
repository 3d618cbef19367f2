#pragma once

namespace sentrova {

// The command provision_credential: makes a credential store for user 0 from its arguments and, for
// a status other than 0, from one line of `input_fd`, the password. Messages go to standard error,
// the help text to standard output. Not for two threads at once (getopt). Returns the exit status:
// 0 done, 1 the store could not be made, 2 wrong arguments or no usable password.
int provision(int argc, char** argv, int input_fd);

}  // namespace sentrova
