#include "cli/power_commands.h"

#include <android-base/logging.h>
#include <stdio.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>

#include "cli/exit_status.h"
#include "otautil/sysutil.h"

namespace sentrova {
namespace {

ExitStatus shut_down(const std::string& reason, const Output& output) {
  if (!Shutdown(reason)) {
    output.error("the device's init cannot be asked");
    return kExitServiceFailed;
  }
  output.result("the device is powering off", {{"requested", true}});
  return kExitSuccess;
}

// Does not return: init ends the device. There is no result to print, but where init cannot be
// asked the library aborts, which is an error like others here.
[[noreturn]] void reboot(const std::string& reason, const Output& output) {
  android::base::SetAborter([&output](const char*) {
    output.error("the device's init cannot be asked");
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
      ->callback([reason, &output] { reboot(*reason, output); });
  add_command(app, "shutdown", "Power the device off at once, without asking", reason,
              "Why, for the device's records")
      ->callback([reason, &output, &status] { status = shut_down(*reason, output); });
}

}  // namespace sentrova
