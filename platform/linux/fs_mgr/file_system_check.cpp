#include "platform/linux/fs_mgr/file_system_check.h"

#include <android-base/logging.h>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <iterator>
#include <string_view>

namespace sentrova::fs_mgr {

namespace {

struct CheckTool {
  std::string_view fs_type;
  const char* path;
  // Nothing but what is safe to do unasked. Above all, e2fsck then leaves alone a volume without a
  // superblock: it may be encrypted, with spare superblocks from before still in place.
  const char* option;
};

constexpr CheckTool kCheckTools[] = {
    {"ext4", "/system/bin/e2fsck", "-p"},
    {"f2fs", "/system/bin/fsck.f2fs", "-a"},
};

void run_tool(const CheckTool& tool, std::string device) {
  std::string path = tool.path;
  std::string option = tool.option;
  char* const arguments[] = {path.data(), option.data(), device.data(), nullptr};
  // The program's standard output is its log; the tool's chatter does not belong there.
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  pid_t child = -1;
  const int error = posix_spawn(&child, tool.path, &actions, nullptr, arguments, environ);
  posix_spawn_file_actions_destroy(&actions);
  if (error != 0) {
    LOG(WARNING) << "cannot run " << tool.path << ": " << strerror(error);
    return;
  }
  int status = 0;
  if (TEMP_FAILURE_RETRY(waitpid(child, &status, 0)) != child) {
    PLOG(WARNING) << "lost " << tool.path;
  } else if (status != 0) {
    LOG(WARNING) << tool.path << " on " << device << " ended with wait status " << status;
  }
}

}  // namespace

void repair_file_system(const std::string& device, const std::string& fs_type) {
  const auto* const tool =
      std::find_if(std::begin(kCheckTools), std::end(kCheckTools),
                   [&fs_type](const CheckTool& row) { return row.fs_type == fs_type; });
  if (tool != std::end(kCheckTools) && access(tool->path, X_OK) == 0) {
    run_tool(*tool, device);
  }
}

}  // namespace sentrova::fs_mgr
