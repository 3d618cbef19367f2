#include <CLI/CLI.hpp>
#include <cstdio>
#include <exception>
#include <string>

#include "cli/blockmap_command.h"
#include "cli/credential_commands.h"
#include "cli/exit_status.h"
#include "cli/output.h"
#include "cli/power_commands.h"
#include "cli/property_commands.h"
#include "cli/status_command.h"
#include "cli/unlock_command.h"

namespace {

constexpr char kDescription[] =
    "Asks the rescue service of this device about the owner's data and has it unlocked.";
constexpr char kExitStatusHelp[] =
    "Exit status: 0 done, or yes; 1 no (the password is wrong); 2 the command line or the input\n"
    "cannot be used; 3 the service was not reached or died; 4 the service could not do it.\n"
    "A password is asked for without echo on a terminal; otherwise it is the first line of\n"
    "standard input.";
constexpr char kUnlockHelp[] =
    "Unlock the data step by step, asking for the password where one is set (three tries on a "
    "terminal, one otherwise), and show what is readable then";
constexpr char kMethodHelp[] =
    "How the data is encrypted: fbe by file, fde the whole disk, auto as the device says";

struct PropertyVerb {
  const char* name;
  const char* help;
  sentrova::ExitStatus (*command)(const sentrova::Output& output);
};

constexpr PropertyVerb kPropertyVerbs[] = {
    {"load", "Load them from the vendor's partitions, else from the backups",
     sentrova::load_properties},
    {"backup", "Back up their files, or load the backups where they are not ready",
     sentrova::back_up_properties},
    {"clear", "Remove the backups", sentrova::clear_property_backups},
    {"persist", "Load the persistent properties from the data partition",
     sentrova::load_persistent_properties},
};

void add_property_verbs(CLI::App& app, const sentrova::Output& output, int& status) {
  CLI::App* const properties =
      app.add_subcommand("properties", "Load the vendor's properties, in this process");
  properties->require_subcommand(1);
  for (const PropertyVerb& verb : kPropertyVerbs) {
    properties->add_subcommand(verb.name, verb.help)->callback([&] {
      status = verb.command(output);
    });
  }
}

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
  app.add_subcommand("verify", "Check a password")->callback([&] {
    status = sentrova::verify_password(user_id, output);
  });
  app.add_subcommand("status",
                     "Show the credential type, the encryption, the last unlock's result and what "
                     "is mounted at /data")
      ->callback([&] { status = sentrova::show_status(user_id, output); });
  std::string method = sentrova::kMethodAuto;
  CLI::App* unlock = app.add_subcommand("unlock", kUnlockHelp);
  unlock->add_option("--method", method, kMethodHelp)
      ->check(CLI::IsMember(
          {sentrova::kMethodAuto, sentrova::kMethodFileBased, sentrova::kMethodFullDisk}))
      ->capture_default_str();
  unlock->callback([&] { status = sentrova::unlock_data(user_id, method, output); });
  sentrova::add_power_commands(app, output, status);

  add_property_verbs(app, output, status);
  sentrova::add_blockmap_command(app, output, status);

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
