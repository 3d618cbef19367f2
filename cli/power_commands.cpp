#include "cli/power_commands.h"

#include <android-base/logging.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>

#include "cli/exit_status.h"
#include "otautil/sysutil.h"

namespace sentrova {
namespace {

constexpr char kNoInit[] = "the device's init cannot be asked";

// Where processes share no properties, init would never see the request, nor would it fail.
bool has_shared_properties() {
  const char* const folder = getenv("ANDROID_PROPERTY_DIR");
  return access(folder != nullptr ? folder : "/dev/__properties__", F_OK) == 0;
}

ExitStatus shut_down(const std::string& reason, const Output& output) {
  if (!has_shared_properties() || !Shutdown(reason)) {
    output.error(kNoInit);
    return kExitServiceFailed;
  }
  output.result("the device is powering off", {{"requested", true}});
  return kExitSuccess;
}

// Returns only where init cannot be asked: else init ends the device, and there is no result to
// print. A request that is refused makes the library abort, which is an error like others here.
ExitStatus reboot(const std::string& reason, const Output& output) {
  if (!has_shared_properties()) {
    output.error(kNoInit);
    return kExitServiceFailed;
  }
  android::base::SetAborter([&output](const char*) {
    output.error(kNoInit);
    fflush(stdout);
    _exit(kExitServiceFailed);
  });
  Reboot(reason);
}

CLI::App* add_command(CLI::App& app, const char* name, const char* description,
                      const std::shared_ptr<std::string>& reason, const char* reason_description) {
  CLI::App* const command = app.add_subcommand(name, description);
  command->add_option("reason", *reason, reason_description);
  return command;
}

}  // namespace

void add_power_commands(CLI::App& app, const Output& output, int& status) {
  // Shared with the callbacks, which outlive this function.
  const auto reason = std::make_shared<std::string>();
  add_command(app, "reboot", "Reboot the device at once, without asking", reason,
              "Where to, as recovery or bootloader; the system if left out")
      ->callback([reason, &output, &status] { status = reboot(*reason, output); });
  add_command(app, "shutdown", "Power the device off at once, without asking", reason,
              "Why, for the device's records")
      ->callback([reason, &output, &status] { status = shut_down(*reason, output); });
}

}  // namespace sentrova
