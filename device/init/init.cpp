// The first process of the virtual device. It brings the device up, runs a story that the host left
// in /share (or a console), and powers the device off. What it leaves in /share: log.txt (the
// story's output), NAME.log of each service, dmesg.txt, powerctl (the request that ended the run,
// if one did), and, last of all, result: the story's exit status. Without a result the run failed.

#include <android-base/logging.h>
#include <android-base/properties.h>
#include <unistd.h>

#include <string>

#include "device/init/block_links.h"
#include "device/init/boot_properties.h"
#include "device/init/early_mounts.h"
#include "device/init/file_systems.h"
#include "device/init/modules.h"
#include "device/init/process.h"
#include "device/init/results.h"
#include "device/init/services.h"
#include "device/init/supervisor.h"

namespace sentrova::device {
namespace {

constexpr char kShell[] = "/system/bin/sh";
constexpr char kConsole[] = "/dev/ttyAMA0";
constexpr char kStory[] = "/share/story";
constexpr char kStoryLog[] = "/share/log.txt";
// Set by the host on the kernel's command line.
constexpr char kConsoleProperty[] = "ro.boot.console";

const std::vector<ServiceDefinition>& service_table() {
  static const std::vector<ServiceDefinition> table = {
      {"servicemanager", {"/system/bin/servicemanager"}},
      {"property_loader", {"/system/bin/property_loader"}},
      {"rescue_host", {"/system/bin/rescue_host"}},
      {"keystore2", {"/system/bin/keystore2"}, false},
  };
  return table;
}

// What cannot be done here is logged and ends the device's start: the kernel panics when its first
// process ends, and QEMU stops without a result.
void bring_up() {
  if (!mount_kernel_file_systems()) {
    PLOG(FATAL) << "cannot mount the kernel's file systems";
  }
  load_modules("/lib/modules");
  if (!mount_host_folders()) {
    PLOG(FATAL) << "cannot mount the folders that the host shares";
  }
  seed_properties();
  link_partitions("/sys/class/block", "/dev/block/by-name");
  mount_early_volumes();
}

pid_t start_main_program() {
  const bool console = android::base::GetBoolProperty(kConsoleProperty, false);
  const pid_t pid = console ? start_process({{kShell, "-l"}, "", kConsole})
                            : start_process({{kShell, kStory}, kStoryLog, ""});
  if (pid < 0) {
    PLOG(FATAL) << "cannot start " << (console ? "the console" : "the story");
  }
  return pid;
}

void leave_results(const Ending& ending) {
  if (!save_kernel_log("/share/dmesg.txt")) {
    PLOG(ERROR) << "cannot save the kernel's log";
  }
  const bool published =
      ending.power_request
          ? publish("/share/powerctl", android::base::GetProperty("sys.powerctl", "") + "\n")
          : publish("/share/result", std::to_string(shell_status(ending.main_wait_status)) + "\n");
  if (!published) {
    PLOG(ERROR) << "cannot leave the result";
  }
}

[[noreturn]] void run() {
  bring_up();
  Services services(service_table(), "/share");
  std::optional<Supervisor> supervisor = Supervisor::create(services);
  if (!supervisor) {
    PLOG(FATAL) << "cannot watch the properties";
  }
  for (const ServiceDefinition& service : service_table()) {
    if (service.starts_with_device) {
      services.start(service.name);
    }
  }
  const std::optional<Ending> ending = supervisor->run_until_end(start_main_program());
  if (!ending) {
    PLOG(FATAL) << "cannot watch the properties any longer";
  }
  leave_results(*ending);
  carry_out(ending->power_request.value_or(PowerRequest{false, ""}));
  PLOG(FATAL) << "the kernel refuses to stop";
  __builtin_unreachable();
}

}  // namespace
}  // namespace sentrova::device

int main(int, char** argv) {
  android::base::InitLogging(argv, android::base::KernelLogger);
  sentrova::device::run();
}
