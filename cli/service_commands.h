#pragma once

#include "cli/output.h"

namespace CLI {
class App;
}

namespace sentrova {

// Adds the verbs that ask the rescue service, and the option --user for the user whose data they
// are about: password-type, verify, status and unlock. When one is given, `status` becomes its exit
// status. Both objects must outlive the parsing.
void add_service_commands(CLI::App& app, const Output& output, int& status);

}  // namespace sentrova
