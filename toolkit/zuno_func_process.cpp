#include <errno.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>

#include "toolkit/log_tag.h"
#include "toolkit/shell.h"
#include "toolkit/whole_sleep.h"
#include "toolkit/zuno_func.h"

using sentrova::toolkit::kLogTag;
using sentrova::toolkit::kShellArgumentZero;
using sentrova::toolkit::kShellPath;
using sentrova::toolkit::sleep_whole;

namespace {

constexpr unsigned int kPollSeconds = 1;
constexpr int kKillRounds = 5;
constexpr size_t kPieceBytes = 127;
constexpr pid_t kAnyChild = -1;
constexpr pid_t kOwnGroup = 0;

// As getc, but a read that a signal handler interrupted is taken up again, so that nothing of what
// the stream has read so far is lost.
int next_byte(FILE* stream) {
  int byte;
  while ((byte = getc(stream)) == EOF && ferror(stream) != 0 && errno == EINTR) {
    clearerr(stream);
  }
  return byte;
}

// Returns the stream's bytes up to the end of the line, at most kPieceBytes; none at the end of the
// stream and after an error.
std::string read_piece(FILE* stream) {
  std::string piece;
  while (piece.size() < kPieceBytes) {
    const int byte = next_byte(stream);
    if (byte == EOF) {
      break;
    }
    piece.push_back(static_cast<char>(byte));
    if (byte == '\n') {
      break;
    }
  }
  return piece;
}

// Reports a wait without a child; `error` is the errno of the wait. Returns the wait's result.
int report_no_child(const std::string& cmd, int error) {
  if (error == ECHILD) {
    // Whoever reaped the child has seen to its result, so this counts as success.
    fprintf(stdout, "[%s]E: %s no child process exist\n", kLogTag, cmd.c_str());
    return 0;
  }
  fprintf(stdout, "[%s]E: %s Unexpected error %d\n", kLogTag, cmd.c_str(), error);
  return -1;
}

int report_signal(const std::string& cmd, int status) {
  fprintf(stdout, "[%s]E: pid_signal=%s process ended with signal: [%d]\n", kLogTag, cmd.c_str(),
          WTERMSIG(status));
  return -1;
}

void sleep_one_poll() {
  sleep_whole(std::chrono::seconds(kPollSeconds), [] { sleep(kPollSeconds); });
}

void kill_child(pid_t pid, int* status, const std::string& cmd) {
  fprintf(stdout, "[%s]I: %s took too long, killing process\n", kLogTag, cmd.c_str());
  // The id -1 of a failed fork would make the kernel kill every process of the device, and 0 the
  // caller's own group.
  if (pid != kAnyChild && pid != kOwnGroup) {
    kill(pid, SIGKILL);
  }
  pid_t reaped = 0;
  for (int round = 0; round < kKillRounds && reaped == 0; ++round) {
    sleep_one_poll();
    reaped = waitpid(pid, status, WNOHANG);
  }
  if (reaped != 0) {
    fprintf(stdout, "[%s]I: Child process killed successfully\n", kLogTag);
  } else {
    fprintf(stdout, "[%s]I: Child process took too long to kill, may be a zombie process\n",
            kLogTag);
  }
}

}  // namespace

int ZunoFunc::Exec_Cmd(const std::string& cmd, std::string& result) {
  FILE* stream = __popen(cmd.c_str(), "r");
  if (stream == nullptr) {
    return -1;
  }
  for (std::string piece = read_piece(stream); !piece.empty(); piece = read_piece(stream)) {
    result.append(piece.c_str());
  }
  return __pclose(stream);
}

int ZunoFunc::Exec_Cmd(const std::string& cmd) {
  const pid_t pid = fork();
  if (pid == -1) {
    // Field tools look for "vfork" although a plain fork is used.
    fprintf(stdout, "[%s]E: Exec_Cmd(): vfork failed: %d\n", kLogTag, errno);
    return -1;
  }
  if (pid == 0) {
    execl(kShellPath, kShellArgumentZero, "-c", cmd.c_str(), nullptr);
    _exit(127);
  }
  int status = 0;
  return Wait_For_Child(pid, &status, cmd) == 0 ? 0 : -1;
}

int ZunoFunc::Exec_Cmd(const std::vector<std::string>& args) {
  if (args.empty()) {
    return -1;
  }
  std::vector<char*> argv;
  argv.reserve(args.size() + 1);
  for (const std::string& arg : args) {
    argv.push_back(const_cast<char*>(arg.c_str()));
  }
  argv.push_back(nullptr);

  const pid_t pid = fork();
  if (pid == 0) {
    execv(argv[0], argv.data());
    _exit(1);
  }
  if (pid == -1) {
    fprintf(stdout, "[%s]E: Exec_Cmd(): fork failed: %d!\n", kLogTag, errno);
  } else {
    // At error level although nothing failed: field tools read the id from here.
    fprintf(stdout, "[%s]E: Exec_Cmd(): pid: %d!\n", kLogTag, pid);
  }
  return pid;
}

int ZunoFunc::Wait_For_Child(pid_t pid, int* status, std::string cmd) {
  if (waitpid(pid, status, 0) < 1) {
    return report_no_child(cmd, errno);
  }
  if (WIFSIGNALED(*status)) {
    return report_signal(cmd, *status);
  }
  const int exit_code = WEXITSTATUS(*status);
  if (exit_code != 0) {
    fprintf(stdout, "[%s]E: pid_error=%s process ended with ERROR: %d\n", kLogTag, cmd.c_str(),
            exit_code);
    return -1;
  }
  // At error level although nothing failed; relied upon.
  fprintf(stdout, "[%s]E: %s process ended with RC=%d\n", kLogTag, cmd.c_str(), exit_code);
  return 0;
}

int ZunoFunc::Wait_For_Child_Timeout(pid_t pid, int* status, const std::string& cmd,
                                     int timeout_seconds) {
  pid_t reaped = waitpid(pid, status, WNOHANG);
  for (int remaining = timeout_seconds; remaining != 0 && reaped == 0;) {
    sleep_one_poll();
    reaped = waitpid(pid, status, WNOHANG);
    if (remaining > 0) {
      --remaining;
    }
  }
  if (reaped == 0) {
    kill_child(pid, status, cmd);
    return -1;
  }
  if (reaped < 0) {
    return report_no_child(cmd, errno);
  }
  // Unlike Wait_For_Child, a child that ended by itself is a success whatever its exit code.
  return WIFSIGNALED(*status) ? report_signal(cmd, *status) : 0;
}
