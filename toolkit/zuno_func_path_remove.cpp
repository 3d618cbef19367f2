#include <android-base/errno_restorer.h>
#include <dirent.h>
#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <optional>

#include "toolkit/directory_listing.h"
#include "toolkit/log_tag.h"
#include "toolkit/zuno_func.h"

using sentrova::toolkit::DirectoryEntry;
using sentrova::toolkit::kLogTag;
using sentrova::toolkit::list_directory;

namespace {

int remove_file_entry(const std::string& path) {
  const int result = unlink(path.c_str());
  if (result != 0) {
    const android::base::ErrnoRestorer keep_errno;
    fprintf(stdout, "[%s]I: Unable to unlink '%s: %s'\n", kLogTag, path.c_str(), strerror(errno));
  }
  return result;
}

int remove_directory_entry(const std::string& path) {
  const int result = ZunoFunc::Remove_Dir(path, true);
  return result != 0 ? result : rmdir(path.c_str());
}

// Removes one entry of a directory. Devices and entries of unknown type are left in place, which is
// a success.
int remove_entry(const std::string& path, unsigned char type) {
  switch (type) {
    case DT_FIFO:
    case DT_REG:
    case DT_LNK:
    case DT_SOCK:
      return remove_file_entry(path);
    case DT_DIR:
      return remove_directory_entry(path);
    default:
      return 0;
  }
}

}  // namespace

int ZunoFunc::Remove_Dir(std::string path, bool keep_root) {
  const std::optional<std::vector<DirectoryEntry>> entries = list_directory(path);
  if (!entries.has_value()) {
    const android::base::ErrnoRestorer keep_errno;
    fprintf(stdout, "[%s]E: rror_opening_strerr=Error opening: %s %s\n", kLogTag, path.c_str(),
            strerror(errno));
    return -1;
  }
  for (const DirectoryEntry& entry : *entries) {
    const int result = remove_entry(path + "/" + entry.name, entry.type);
    if (result != 0) {
      return result;
    }
  }
  return keep_root ? 0 : rmdir(path.c_str());
}

int ZunoFunc::Remove_File(std::string path) {
  constexpr int kEmptyPath = -2;
  if (path.empty()) {
    return kEmptyPath;
  }
  return Path_Exists(path) ? unlink(path.c_str()) : 0;
}
