#include <CLI/CLI.hpp>
#include <cstdio>
#include <exception>

#include "cli/credential_commands.h"
#include "cli/exit_status.h"
#include "cli/output.h"

namespace {

constexpr char kDescription[] = "Asks the rescue service of this device about the owner's data.";
constexpr char kExitStatusHelp[] =
    "Exit status: 0 done, or yes; 1 no (the password is wrong); 2 the command line or the input\n"
    "cannot be used; 3 the service was not reached or died; 4 the service could not do it.";

int run(int argc, char** argv) {
  CLI::App app(kDescription, "sentrova");
  app.footer(kExitStatusHelp);
  app.require_subcommand(1);
  app.fallthrough();
  int user_id = 0;
  bool json = false;
  app.add_option("--user", user_id, "The user id (0 is the owner)")->capture_default_str();
  app.add_flag("--json", json, "Print one JSON object instead of text");

  const sentrova::Output output(json);
  int status = sentrova::kExitSuccess;
  app.add_subcommand("password-type", "Show what kind of credential locks the data")->callback([&] {
    status = sentrova::show_password_type(user_id, output);
  });
  app.add_subcommand("verify",
                     "Check a password: asked for without echo on a terminal, otherwise the first "
                     "line of standard input")
      ->callback([&] { status = sentrova::verify_password(user_id, output); });

  try {
    app.parse(argc, argv);
  } catch (const CLI::ExtrasError&) {
    // What was given is not repeated: it may be a password.
    output.error("an argument was not expected; passwords are never taken from the command line");
    return sentrova::kExitUsage;
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == static_cast<int>(CLI::ExitCodes::Success)) {
      return app.exit(error);  // help
    }
    output.error(error.what());
    return sentrova::kExitUsage;
  }
  return status;
}

}  // namespace

int main(int argc, char** argv) {
  try {
    const int status = run(argc, argv);
    if (fflush(stdout) != 0 || ferror(stdout) != 0) {
      fprintf(stderr, "sentrova: the answer could not be written\n");
      return sentrova::kExitServiceFailed;
    }
    return status;
  } catch (const std::exception& error) {
    fprintf(stderr, "sentrova: %s\n", error.what());
    return sentrova::kExitServiceFailed;
  }
}
