#include <android-base/file.h>
#include <android-base/parseint.h>
#include <android-base/stringprintf.h>
#include <android-base/strings.h>
#include <signal.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <optional>
#include <string>
#include <string_view>
#include <unordered_set>

#include "common/streams.h"
#include "recovery_utils/mounts_ex.h"
#include "recovery_utils/mounts_ex_log.h"

using android::base::ParseInt;
using android::base::Readlink;
using android::base::StartsWith;
using android::base::StringPrintf;
using sentrova::Directory;
using sentrova::File;
using sentrova::mounts_ex::kLogTag;

namespace android::recovery {
namespace {

// Memory for one line of a text stream, which grows with the longest line.
class LineBuffer {
 public:
  LineBuffer() = default;
  ~LineBuffer() { free(text_); }
  LineBuffer(const LineBuffer&) = delete;
  LineBuffer& operator=(const LineBuffer&) = delete;

  // Returns the next line of `file` without its line end, valid until the next call, or nothing at
  // the end or on an error.
  std::optional<std::string_view> read(FILE* file) {
    const ssize_t length = getline(&text_, &capacity_, file);
    if (length < 0) {
      return std::nullopt;
    }
    std::string_view line(text_, static_cast<size_t>(length));
    if (line.ends_with('\n')) {
      line.remove_suffix(1);
    }
    return line;
  }

 private:
  char* text_ = nullptr;
  size_t capacity_ = 0;
};

bool has_maps(const std::string& maps_path, const std::string& prefix) {
  char buffer[4096];  // the kernel gives a page at a time
  const File maps(fopen(maps_path.c_str(), "re"));
  if (maps == nullptr) {
    return false;
  }
  setvbuf(maps.get(), buffer, _IOFBF, sizeof(buffer));
  LineBuffer buffered_line;
  bool found = false;
  while (const auto line = buffered_line.read(maps.get())) {
    const size_t start = line->find('/');
    if (start == std::string_view::npos || !StartsWith(line->substr(start), prefix)) {
      continue;
    }
    fprintf(stdout, "[%s]W: Found map %s referencing %s\n", kLogTag, maps_path.c_str(),
            std::string(line->substr(start)).c_str());
    found = true;
  }
  return found;
}

bool has_descriptors(const std::string& directory_path, const std::string& prefix) {
  const Directory directory(opendir(directory_path.c_str()));
  if (directory == nullptr) {
    fprintf(stdout, "[%s]W: Failed to open %s\n", kLogTag, directory_path.c_str());
    return false;
  }
  bool found = false;
  while (const dirent* entry = readdir(directory.get())) {
    if (entry->d_type == DT_LNK) {
      found |= checkSymlink(directory_path + "/" + entry->d_name, prefix);
    }
  }
  return found;
}

// Every reference is looked for, also after a match, because each is logged.
bool references(pid_t pid, const std::string& prefix) {
  const std::string base = StringPrintf("/proc/%d", pid);
  bool found = has_maps(base + "/maps", prefix);
  for (const char* link : {"/cwd", "/root", "/exe"}) {
    found |= checkSymlink(base + link, prefix);
  }
  found |= has_descriptors(base + "/fd", prefix);
  return found;
}

std::unordered_set<pid_t> find_holders(DIR* proc, const std::string& prefix) {
  std::unordered_set<pid_t> holders;
  while (const dirent* entry = readdir(proc)) {
    pid_t pid;
    if (entry->d_type == DT_DIR && ParseInt(entry->d_name, &pid) && references(pid, prefix)) {
      holders.insert(pid);
    }
  }
  return holders;
}

void signal_holder(pid_t pid, int signal, pid_t own_pid) {
  std::string name;
  if (!android::base::ReadFileToString(StringPrintf("/proc/%d/cmdline", pid), &name)) {
    name = "???";
  }
  // c_str: the program's name ends at the first of the zero bytes that separate the arguments.
  if (pid == own_pid) {
    fprintf(stdout,
            "[%s]W: Kill Processes With Open Files -> Can't kill Process itself (name : %s , pid : "
            "%d), will skip to next\n",
            kLogTag, name.c_str(), pid);
    return;
  }
  fprintf(stdout, "[%s]W: Kill Processes With Open Files -> Sending %s to %s , pid %d\n", kLogTag,
          strsignal(signal), name.c_str(), pid);
  kill(pid, signal);
}

}  // namespace

bool checkSymlink(const std::string& path, const std::string& prefix) {
  std::string target;
  if (!Readlink(path, &target) || !StartsWith(target, prefix)) {
    return false;
  }
  fprintf(stdout, "[%s]W: Found symlink %s referencing %s\n", kLogTag, path.c_str(),
          target.c_str());
  return true;
}

int KillProcessesWithOpenFiles(const char* path, int signal) {
  if (path == nullptr) {
    fprintf(stdout, "[%s]E: Invalid parameters\n", kLogTag);
    return -1;
  }
  const std::string prefix = path;
  const pid_t own_pid = getpid();
  const Directory proc(opendir("/proc"));
  if (proc == nullptr) {
    fprintf(stdout, "[%s]E: Failed to open proc\n", kLogTag);
    return -1;
  }
  const std::unordered_set<pid_t> holders = find_holders(proc.get(), prefix);
  if (signal != 0) {
    for (const pid_t pid : holders) {
      signal_holder(pid, signal, own_pid);
    }
  }
  return static_cast<int>(holders.size());
}

}  // namespace android::recovery
