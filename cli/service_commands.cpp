#include "cli/service_commands.h"

#include <android-base/parseint.h>

#include <CLI/CLI.hpp>
#include <memory>
#include <string>

#include "cli/credential_commands.h"
#include "cli/status_command.h"
#include "cli/unlock_command.h"

namespace sentrova {
namespace {

constexpr char kStatusHelp[] = "Show the credential type, the encryption and the state of /data";
constexpr char kUnlockHelp[] = "Unlock the data step by step and show what is readable then";
constexpr char kUnlockDetails[] =
    "The password is asked for where one is set: three tries on a terminal, one otherwise.";
constexpr char kVerifyDetails[] = "Nothing is unlocked. Exit status 1 when it is wrong.";
constexpr char kMethodHelp[] = "fbe (by file), fde (the whole disk) or auto (as the device says)";

struct ServiceVerb {
  const char* name;
  const char* help;
  const char* details;
  ExitStatus (*command)(int user_id, const Output& output);
};

constexpr ServiceVerb kServiceVerbs[] = {
    {"password-type", "Show what kind of credential locks the data", "Type 0 stands for none.",
     show_password_type},
    {"verify", "Check a password", kVerifyDetails, verify_password},
    {"status", kStatusHelp, "Exit status 3 when the service does not tell the credential type.",
     show_status},
};

// Shared with the callbacks, which outlive the function that adds them.
struct Arguments {
  int user_id = 0;
  std::string method = kMethodAuto;
};

// Returns an empty text, or what is wrong with it.
std::string check_user_id(const std::string& text) {
  int id = 0;
  return android::base::ParseInt(text, &id, 0) ? "" : "a user id is a number from 0";
}

}  // namespace

void add_service_commands(CLI::App& app, const Output& output, int& status) {
  const auto arguments = std::make_shared<Arguments>();
  app.add_option("--user", arguments->user_id, "The user id (0 is the owner)")
      ->check(check_user_id)
      ->capture_default_str();
  for (const ServiceVerb& verb : kServiceVerbs) {
    CLI::App* const command = app.add_subcommand(verb.name, verb.help);
    command->footer(verb.details + ("\n\n" + app.get_footer()));
    command->callback([arguments, &verb, &output, &status] {
      status = verb.command(arguments->user_id, output);
    });
  }
  CLI::App* const unlock = app.add_subcommand("unlock", kUnlockHelp);
  unlock->footer(kUnlockDetails + ("\n\n" + app.get_footer()));
  unlock->add_option("--method", arguments->method, kMethodHelp)
      ->check(CLI::IsMember({kMethodAuto, kMethodFileBased, kMethodFullDisk}))
      ->capture_default_str();
  unlock->callback([arguments, &output, &status] {
    status = unlock_data(arguments->user_id, arguments->method, output);
  });
}

}  // namespace sentrova
