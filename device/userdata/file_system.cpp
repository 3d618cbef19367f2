#include "device/userdata/file_system.h"

#include <android-base/macros.h>
#include <android-base/strings.h>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <vector>

namespace sentrova {
namespace {

bool run_tool(std::vector<std::string> words, std::string& error) {
  std::vector<char*> arguments;
  for (std::string& word : words) {
    arguments.push_back(word.data());
  }
  arguments.push_back(nullptr);
  // The tools tell of every step on standard output; what is wrong goes to standard error.
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  pid_t child = -1;
  int wait_status = -1;
  const int spawn_error =
      posix_spawn(&child, arguments[0], &actions, nullptr, arguments.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  if (spawn_error != 0 || TEMP_FAILURE_RETRY(waitpid(child, &wait_status, 0)) != child ||
      wait_status != 0) {
    error = "failed: " + android::base::Join(words, ' ');
    return false;
  }
  return true;
}

}  // namespace

bool make_file_system(const std::string& type, const std::string& block_device,
                      std::string& error) {
  if (type == "f2fs") {
    return run_tool({"/system/bin/make_f2fs", "-q", "-f", "-g", "android", block_device}, error);
  }
  return run_tool({"/system/bin/mke2fs", "-q", "-F", "-t", "ext4", "-b", "4096", "-I", "512", "-O",
                   "encrypt,stable_inodes", block_device},
                  error);
}

}  // namespace sentrova
