#include <android-base/properties.h>
#include <android-base/stringprintf.h>
#include <signal.h>
#include <string.h>
#include <unistd.h>

#include <array>

#include "common/streams.h"
#include "recovery_utils/mounts_ex.h"
#include "recovery_utils/mounts_ex_log.h"

using android::base::StringPrintf;
using sentrova::Directory;
using sentrova::File;
using sentrova::mounts_ex::kLogTag;

namespace {

constexpr char kService[] = "keystore";
constexpr useconds_t kKillDelayMicroseconds = 5'000;

// Later arguments do not count: an editor of a key store's file is no key store. Nor does what
// stands beyond the buffer.
bool names_service(FILE* command_line) {
  std::array<char, 4096> first_argument = {};
  return fgets(first_argument.data(), static_cast<int>(first_argument.size()), command_line) !=
             nullptr &&
         strstr(first_argument.data(), kService) != nullptr;
}

void end_if_key_store(pid_t pid) {
  const File command_line(fopen(StringPrintf("/proc/%d/cmdline", pid).c_str(), "re"));
  if (command_line == nullptr || !names_service(command_line.get())) {
    return;
  }
  fprintf(stdout, "[%s]W: %s pid %d found, sending kill.\n\n", kLogTag, kService, pid);
  kill(pid, SIGINT);
  usleep(kKillDelayMicroseconds);
  kill(pid, SIGKILL);
}

}  // namespace

void force_progress_release_file() {
  fprintf(stdout, "[%s]I: Stopping keystore...\n", kLogTag);
  android::base::SetProperty("ctl.stop", kService);
  const Directory proc(opendir("/proc"));
  if (proc == nullptr) {
    return;
  }
  while (const dirent* entry = readdir(proc.get())) {
    pid_t pid;
    if (sscanf(entry->d_name, "%d", &pid) == 1) {
      end_if_key_store(pid);
    }
  }
}
