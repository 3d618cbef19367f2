#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <memory>
#include <mutex>
#include <string_view>
#include <utility>

#include "common/streams.h"
#include "toolkit/shell.h"
#include "toolkit/zuno_func.h"

using android::base::unique_fd;

namespace {

struct FreeMemory {
  void operator()(void* memory) const { free(memory); }
};

// One stream from __popen. It stays in the list until its __pclose, also when its user closes the
// stream in another way.
struct PipeStream {
  PipeStream* next;
  FILE* stream;
  pid_t pid;
};

using PipeStreamPtr = std::unique_ptr<PipeStream, FreeMemory>;

std::mutex streams_mutex;
PipeStream* streams = nullptr;  // newest first; guarded by streams_mutex

void add_stream(PipeStreamPtr record) {
  const std::lock_guard lock(streams_mutex);
  record->next = streams;
  streams = record.release();
}

// Takes the stream's record out of the list. Returns null if there is none.
PipeStreamPtr remove_stream(FILE* stream) {
  const std::lock_guard lock(streams_mutex);
  for (PipeStream** link = &streams; *link != nullptr; link = &(*link)->next) {
    if ((*link)->stream == stream) {
      PipeStreamPtr record(*link);
      *link = record->next;
      return record;
    }
  }
  return nullptr;
}

// Makes `fd` the descriptor `target` and runs the command. Every pipe end of this and the other
// streams is close-on-exec, so only `target` reaches the command. Runs in the memory of the parent,
// so it does nothing but system calls.
[[noreturn]] void run_command(int fd, int target, const char* command) {
  if (fd == target) {
    fcntl(fd, F_SETFD, 0);
  } else {
    dup2(fd, target);
  }
  execl(sentrova::toolkit::kShellPath, sentrova::toolkit::kShellArgumentZero, "-c", command,
        nullptr);
  _exit(127);
}

// Returns the child's process id, or -1 with errno.
pid_t start_command(int fd, int target, const char* command) {
  const pid_t pid = vfork();
  if (pid == 0) {
    // A function of system calls only, which does not return.
    run_command(fd, target, command);  // NOLINT(clang-analyzer-unix.Vfork)
  }
  return pid;
}

}  // namespace

FILE* __popen(const char* command, const char* mode) {
  const bool reads = mode != nullptr && std::string_view(mode) == "r";
  const bool writes = mode != nullptr && std::string_view(mode) == "w";
  if (!reads && !writes) {
    errno = EINVAL;
    return nullptr;
  }
  PipeStreamPtr record(static_cast<PipeStream*>(malloc(sizeof(PipeStream))));
  unique_fd read_end;
  unique_fd write_end;
  if (record == nullptr || !android::base::Pipe(&read_end, &write_end)) {
    return nullptr;
  }
  unique_fd& own_end = reads ? read_end : write_end;
  const unique_fd& child_end = reads ? write_end : read_end;

  // The stream is opened before the command is started, so that there is nothing to take back.
  sentrova::File stream(android::base::Fdopen(std::move(own_end), mode));
  if (stream == nullptr) {
    return nullptr;
  }
  record->stream = stream.get();
  record->pid = start_command(child_end.get(), reads ? STDOUT_FILENO : STDIN_FILENO, command);
  if (record->pid == -1) {
    return nullptr;
  }
  add_stream(std::move(record));
  return stream.release();
}

int __pclose(FILE* stream) {
  const PipeStreamPtr record = remove_stream(stream);
  if (record == nullptr) {
    return -1;
  }
  fclose(stream);
  int status = 0;
  return TEMP_FAILURE_RETRY(waitpid(record->pid, &status, 0)) == -1 ? -1 : status;
}
