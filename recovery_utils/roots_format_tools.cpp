#include "recovery_utils/roots_format_tools.h"

#include <sys/wait.h>
#include <unistd.h>

#include <vector>

#include "otautil/sysutil.h"
#include "recovery_utils/roots_format_log.h"

namespace sentrova {
namespace {

constexpr int kCoreDumpBit = 0x80;

// Runs a program to its end and returns its exit code, or -1 if it could not be run or its end not
// be learned. One that a signal killed leaves a line in the log but counts as exit code 0: callers
// rely on the second byte of the status, as it stands.
int exec_cmd(const std::vector<std::string>& args) {
  if (args.empty()) {
    log_at(format_log::at(190), android::base::FATAL, "Check failed: !args.empty() ");
  }
  const std::vector<char*> argv = StringVectorToNullTerminatedArray(args);
  const pid_t child = fork();
  if (child == -1) {
    format_log::error(195, "Failed to fork child process");
    return -1;
  }
  if (child == 0) {
    execv(argv[0], argv.data());
    _exit(1);
  }
  int status = 0;
  if (TEMP_FAILURE_RETRY(waitpid(child, &status, 0)) == -1) {
    return -1;
  }
  const int exit_code = WEXITSTATUS(status);
  if ((status & ~kCoreDumpBit) != 0) {
    format_log::error(207, args[0] + " failed with status " + std::to_string(exit_code));
  }
  return exit_code;
}

}  // namespace

bool make_ext4(const FormatPlan& plan, const std::string& directory) {
  int result = exec_cmd(mke2fs_arguments(plan));
  if (result == 0 && !directory.empty()) {
    result = exec_cmd(e2fsdroid_arguments(plan, directory));
  }
  if (result != 0) {
    format_log::system_error(413, "format_volume: Failed to make ext4 on " + plan.target.device);
  }
  return result == 0;
}

bool make_f2fs(const FormatPlan& plan, const std::string& directory) {
  if (exec_cmd(make_f2fs_arguments(plan)) != 0) {
    format_log::system_error(458, "format_volume: Failed to make_f2fs on " + plan.target.device);
    return false;
  }
  if (!directory.empty() && exec_cmd(sload_f2fs_arguments(plan, directory)) != 0) {
    format_log::system_error(466, "format_volume: Failed to sload_f2fs on " + plan.target.device);
    return false;
  }
  return true;
}

}  // namespace sentrova
