#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <optional>
#include <utility>

#include "toolkit/directory_listing.h"
#include "toolkit/directory_status.h"
#include "toolkit/file_copy.h"
#include "toolkit/file_stream.h"
#include "toolkit/log_tag.h"
#include "toolkit/zuno_func.h"

using android::base::unique_fd;
using sentrova::toolkit::DirectoryEntry;
using sentrova::toolkit::kLogTag;
using sentrova::toolkit::kStatusDirectory;
using sentrova::toolkit::list_directory;

namespace {

constexpr mode_t kCopiedMode = 0755;
constexpr uid_t kSystemUser = 1000;  // the platform's user "system" and its group
constexpr gid_t kSystemGroup = 1000;

std::string with_trailing_slash(std::string path) {
  if (!path.ends_with('/')) {
    path += '/';
  }
  return path;
}

void copy_file_entry(const std::string& source, const std::string& destination) {
  if (ZunoFunc::copy_file(source, destination, kCopiedMode) != 0 ||
      chmod(destination.c_str(), kCopiedMode) != 0 ||
      chown(destination.c_str(), kSystemUser, kSystemGroup) != 0) {
    fprintf(stdout, "Copy From %s To %s FAILED\n", source.c_str(), destination.c_str());
  }
}

// Copies one entry of a directory; both directories end in a slash. Nothing it meets is an error of
// the whole: callers rely on getting what can be copied.
void copy_entry(const std::string& source_directory, const std::string& destination_directory,
                const std::string& name) {
  const std::string source = source_directory + name;
  const std::string destination = destination_directory + name;
  if (ZunoFunc::Dir_Status(source) != kStatusDirectory) {
    copy_file_entry(source, destination);
  } else if (!name.starts_with('.')) {
    ZunoFunc::copy_dir(source, destination);
  }
}

bool can_open_directory(const std::string& path) {
  return unique_fd(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)).ok();
}

}  // namespace

int ZunoFunc::copy_file(std::string source, std::string destination, int mode) {
  fprintf(stdout, "[%s]I: Copying file '%s' to '%s'\n", kLogTag, source.c_str(),
          destination.c_str());
  {
    // A source that is missing or cannot be read leaves an empty destination: callers that care
    // look at the source first.
    const unique_fd from = sentrova::toolkit::open_to_read(source);
    const unique_fd to = sentrova::toolkit::open_to_write(destination, O_TRUNC);
    if (from.ok() && to.ok()) {
      sentrova::toolkit::copy_contents(from, to);
    }
  }
  return chmod(destination.c_str(), static_cast<mode_t>(mode)) == 0 ? 0 : -1;
}

int ZunoFunc::copy_dir(std::string source, std::string destination) {
  const bool destination_opens = can_open_directory(destination);
  const std::optional<std::vector<DirectoryEntry>> entries = list_directory(source);
  if (!entries.has_value()) {
    if (errno != ENOENT) {
      return -1;
    }
    fprintf(stdout, "[%s]E: Failed to opendir:%s (%s)\n", kLogTag, source.c_str(),
            strerror(ENOENT));
    return 0;
  }
  if (!destination_opens &&
      !Create_Dir_Recursive(destination, kCopiedMode, kSystemUser, kSystemGroup)) {
    fprintf(stdout, "Create Dir %s Failed...\n", destination.c_str());
    return -1;
  }
  source = with_trailing_slash(std::move(source));
  destination = with_trailing_slash(std::move(destination));
  for (const DirectoryEntry& entry : *entries) {
    copy_entry(source, destination, entry.name);
  }
  return 0;
}
