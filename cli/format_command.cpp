#include "cli/format_command.h"

#include <android-base/file.h>
#include <stdio.h>
#include <unistd.h>

#include <chrono>
#include <nlohmann/json.hpp>

#include "cli/format_target.h"
#include "cli/library_messages.h"
#include "cli/mounts.h"
#include "cli/progress.h"
#include "cli/volume_table.h"
#include "recovery_utils/roots.h"

namespace sentrova {
namespace {

using android::fs_mgr::FstabEntry;

constexpr char kConfirmation[] = "yes";

void show_lines(const std::string& text) {
  fprintf(stderr, "%s\n", text.c_str());
}

// One line of standard input without its end; what the end of the input cuts off is no answer.
std::string read_answer() {
  std::string line;
  char character = 0;
  while (read(STDIN_FILENO, &character, 1) == 1) {
    if (character == '\n') {
      return line;
    }
    line += character;
  }
  return "";
}

bool confirm() {
  fprintf(stderr, "Type \"%s\" to format: ", kConfirmation);
  return read_answer() == kConfirmation;
}

ExitStatus run_format(const FstabEntry& row, const std::string& directory, const Output& output) {
  bool revert_userdata = false;
  int result = 0;
  const auto start = std::chrono::steady_clock::now();
  {
    const LibraryMessagesToStderr messages;
    const Progress progress("formatting " + row.mount_point);
    result = format_volume(row.mount_point, directory, revert_userdata);
  }
  const std::chrono::duration<double> time = std::chrono::steady_clock::now() - start;
  if (result != 0) {
    output.error("cannot format " + row.mount_point + "; the messages tell how far it came");
    return kExitServiceFailed;
  }
  char seconds[32];
  snprintf(seconds, sizeof(seconds), " (%.2f s)", time.count());
  output.result(row.mount_point + " is formatted: " + row.fs_type + seconds,
                {{"mount_point", row.mount_point},
                 {"device", row.blk_device},
                 {"file_system", row.fs_type},
                 {"userdata_reverted", revert_userdata},
                 {"seconds", time.count()}});
  return kExitSuccess;
}

// Whether nothing keeps the row's volume from being formatted on that device; tells what does.
bool can_format(const FstabEntry& row, const std::string& directory, dev_t device,
                const Output& output) {
  const std::string obstacle = block_device(row.blk_device) == device
                                   ? find_format_obstacle(row, directory)
                                   : row.blk_device + " is another device by now";
  if (!obstacle.empty()) {
    output.error(obstacle);
  }
  return obstacle.empty();
}

ExitStatus format_row(const FstabEntry& row, const std::string& directory, bool is_confirmed,
                      const Output& output) {
  const dev_t device = block_device(row.blk_device);
  if (!can_format(row, directory, device, output)) {
    return kExitUsage;
  }
  show_lines(describe_format(row, directory));
  if (!is_confirmed && isatty(STDIN_FILENO) == 0) {
    output.error("nobody can be asked without a terminal; --yes goes on without asking");
    return kExitUsage;
  }
  if (!is_confirmed && !confirm()) {
    output.error("not confirmed, nothing was changed");
    return kExitAnswerIsNo;
  }
  // Nobody knows how long the question stood there.
  return can_format(row, directory, device, output) ? run_format(row, directory, output)
                                                    : kExitUsage;
}

}  // namespace

ExitStatus format_volume_of_table(const std::string& volume, const std::string& directory,
                                  bool is_confirmed, const Output& output) {
  std::string real_directory = directory;
  if (!directory.empty() && !android::base::Realpath(directory, &real_directory)) {
    output.error(directory + " is not a directory");
    return kExitUsage;
  }
  if (!load_volumes(output)) {
    return kExitServiceFailed;
  }
  const FstabEntry* row = volume_for_mount_point(table_path(volume));
  if (row == nullptr) {
    output.error("this device has no volume " + volume + "; `sentrova volumes` lists them");
    return kExitUsage;
  }
  return format_row(FstabEntry(*row), real_directory, is_confirmed, output);
}

}  // namespace sentrova
