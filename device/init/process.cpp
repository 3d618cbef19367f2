#include "device/init/process.h"

#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <string.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>

namespace sentrova::device {
namespace {

constexpr const char* kEnvironment[] = {
    "PATH=/system/bin:/vendor/bin:/sbin:/bin:/usr/sbin:/usr/bin", "HOME=/", "TMPDIR=/tmp",
    "TERM=vt100", nullptr};

constexpr mode_t kLogMode = 0644;

class FileActions {
 public:
  FileActions() { posix_spawn_file_actions_init(&actions_); }
  ~FileActions() { posix_spawn_file_actions_destroy(&actions_); }
  FileActions(const FileActions&) = delete;
  FileActions& operator=(const FileActions&) = delete;

  void open(int descriptor, const char* path, int flags) {
    posix_spawn_file_actions_addopen(&actions_, descriptor, path, flags, kLogMode);
  }
  void duplicate(int from, int to) { posix_spawn_file_actions_adddup2(&actions_, from, to); }
  const posix_spawn_file_actions_t* get() const { return &actions_; }

 private:
  posix_spawn_file_actions_t actions_;
};

class Attributes {
 public:
  Attributes() {
    posix_spawnattr_init(&attributes_);
    sigset_t none;
    sigemptyset(&none);
    posix_spawnattr_setsigmask(&attributes_, &none);
    posix_spawnattr_setflags(&attributes_, POSIX_SPAWN_SETSID | POSIX_SPAWN_SETSIGMASK);
  }
  ~Attributes() { posix_spawnattr_destroy(&attributes_); }
  Attributes(const Attributes&) = delete;
  Attributes& operator=(const Attributes&) = delete;

  const posix_spawnattr_t* get() const { return &attributes_; }

 private:
  posix_spawnattr_t attributes_;
};

}  // namespace

pid_t start_process(const Command& command) {
  FileActions files;
  if (command.terminal_path.empty()) {
    files.open(STDIN_FILENO, "/dev/null", O_RDONLY);
    files.open(STDOUT_FILENO, command.log_path.c_str(), O_WRONLY | O_CREAT | O_APPEND);
  } else {
    // The first terminal that the leader of a session opens becomes its controlling terminal.
    files.open(STDIN_FILENO, command.terminal_path.c_str(), O_RDWR);
    files.duplicate(STDIN_FILENO, STDOUT_FILENO);
  }
  files.duplicate(STDOUT_FILENO, STDERR_FILENO);

  std::vector<char*> arguments;
  for (const std::string& argument : command.arguments) {
    arguments.push_back(const_cast<char*>(argument.c_str()));
  }
  arguments.push_back(nullptr);
  const Attributes attributes;
  pid_t pid = -1;
  const int error = posix_spawn(&pid, arguments[0], files.get(), attributes.get(), arguments.data(),
                                const_cast<char* const*>(kEnvironment));
  if (error != 0) {
    errno = error;
    return -1;
  }
  return pid;
}

int shell_status(int wait_status) {
  return WIFSIGNALED(wait_status) ? 128 + WTERMSIG(wait_status) : WEXITSTATUS(wait_status);
}

std::string describe_wait_status(int wait_status) {
  if (WIFSIGNALED(wait_status)) {
    return "was killed by signal " + std::to_string(WTERMSIG(wait_status)) + " (" +
           strsignal(WTERMSIG(wait_status)) + ")";
  }
  return "ended with status " + std::to_string(WEXITSTATUS(wait_status));
}

}  // namespace sentrova::device
