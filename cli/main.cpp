#include <android-base/logging.h>
#include <fcntl.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <exception>
#include <nlohmann/json.hpp>
#include <string>
#include <string_view>
#include <vector>

#include "cli/blockmap_command.h"
#include "cli/exit_status.h"
#include "cli/output.h"
#include "cli/power_commands.h"
#include "cli/property_commands.h"
#include "cli/service_commands.h"
#include "cli/volume_commands.h"

namespace {

constexpr char kDescription[] =
    "Asks the rescue service of this device about the owner's data and has it unlocked; looks\n"
    "after the device's volumes.";
constexpr char kVersion[] = "sentrova " SENTROVA_VERSION;

std::string footer() {
  std::string text = "Exit status:\n";
  for (const auto& [status, meaning] : sentrova::kExitStatusMeanings) {
    text += "  " + std::to_string(status) + "  " + meaning + "\n";
  }
  return text +
         "A password is asked for without echo on a terminal; otherwise it is the first line of\n"
         "standard input. --json and --user may also stand behind the verb. What the library logs\n"
         "goes to standard error.";
}

// As the parser will find, but also where it fails before it comes to the option.
bool asks_for_json(int argc, char** argv) {
  return std::any_of(argv + 1, argv + std::max(argc, 1),
                     [](const char* word) { return std::string_view(word) == "--json"; });
}

// Where the parser came to: the program itself or a verb.
const CLI::App& innermost(const CLI::App& app) {
  const std::vector<const CLI::App*> verbs =
      app.get_subcommands([](const CLI::App* verb) { return verb->parsed(); });
  return verbs.empty() ? app : innermost(*verbs.front());
}

std::string name_with_program(const CLI::App& app) {
  return (app.get_parent() == nullptr ? "" : name_with_program(*app.get_parent()) + " ") +
         app.get_name();
}

// What was given too much is not repeated: it may be a password.
std::string describe_unexpected(const CLI::App& verb) {
  const bool takes_password = verb.get_name() == "verify" || verb.get_name() == "unlock";
  return takes_password
             ? "an argument was not expected; passwords are never taken from the command line"
             : "an argument was not expected";
}

bool is_a(const CLI::ParseError& error, CLI::ExitCodes kind) {
  return error.get_exit_code() == static_cast<int>(kind);
}

// What is wrong with the command line: `error` alone does not know the verb.
std::string describe(const CLI::ParseError& error, const CLI::App& app) {
  const CLI::App& verb = innermost(app);
  const std::string help = "; `" + name_with_program(verb) + " --help` ";
  const bool is_extra = is_a(error, CLI::ExitCodes::Success) ||  // help, with more
                        is_a(error, CLI::ExitCodes::ExtrasError);
  const bool is_missing = is_a(error, CLI::ExitCodes::RequiredError);
  if (verb.get_require_subcommand_min() > 0 && (is_extra || is_missing)) {
    return "a verb is missing or unknown" + help + "lists them";
  }
  return (is_extra ? describe_unexpected(verb) : error.what()) + help + "tells what it takes";
}

int parse(CLI::App& app, int argc, char** argv, const sentrova::Output& output) {
  try {
    app.parse(argc, argv);
  } catch (const CLI::CallForVersion&) {
    output.result(kVersion, {{"version", SENTROVA_VERSION}});
  } catch (const CLI::ParseError& error) {
    if (is_a(error, CLI::ExitCodes::Success) && app.remaining_size(true) == 0) {
      return app.exit(error);
    }
    output.error(describe(error, app));
    return sentrova::kExitUsage;
  }
  return sentrova::kExitSuccess;
}

// Where standard input, output or error is closed, the next file to be opened would stand in for
// it: a message of this program, of the library or of a formatting tool could be written to a
// volume. What takes the place here is inherited and can be neither read nor written.
void occupy_closed_standard_streams() {
  int fd = -1;
  do {
    fd = open("/", O_PATH);
  } while (fd >= STDIN_FILENO && fd <= STDERR_FILENO);
  if (fd > STDERR_FILENO) {
    close(fd);
  }
}

int run(int argc, char** argv) {
  CLI::App app(kDescription, "sentrova");
  app.footer(footer());
  app.group("Verbs");  // of the verbs, which take this over
  app.get_formatter()->label("SUBCOMMAND", "VERB");
  app.set_help_flag("-h,--help", "Show this help, or that of the verb, and exit");
  app.require_subcommand(1);
  app.fallthrough();
  bool json = asks_for_json(argc, argv);
  app.add_flag("--json", json, "Print one JSON object instead of text");
  app.set_version_flag("--version", kVersion, "Show the version and exit");

  const sentrova::Output output(json);
  int status = sentrova::kExitSuccess;
  sentrova::add_service_commands(app, output, status);
  sentrova::add_volume_commands(app, output, status);
  sentrova::add_property_commands(app, output, status);
  sentrova::add_blockmap_command(app, output, status);
  sentrova::add_power_commands(app, output, status);
  const int parse_status = parse(app, argc, argv, output);
  return parse_status != sentrova::kExitSuccess ? parse_status : status;
}

}  // namespace

int main(int argc, char** argv) {
  occupy_closed_standard_streams();
  setvbuf(stdout, nullptr, _IOLBF, 0);  // what the library says meanwhile is seen as it comes
  android::base::InitLogging(argv, android::base::StderrLogger);
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
