#include <android-base/errno_restorer.h>
#include <errno.h>
#include <selinux/label.h>
#include <selinux/selinux.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include "toolkit/directory_status.h"
#include "toolkit/log_tag.h"
#include "toolkit/zuno_func.h"

using sentrova::toolkit::kLogTag;
using sentrova::toolkit::kStatusAbsent;
using sentrova::toolkit::kStatusDirectory;

namespace {

// Has the calling thread create files with the label that `handle` knows for `path` and `mode`, or
// without one if it knows none, as long as it lives. Keeps `errno` when it ends.
class CreationLabel {
 public:
  CreationLabel(const selabel_handle* handle, const std::string& path, mode_t mode) {
    // The look-up only fills the handle's caches; its interface has no const.
    if (selabel_lookup(const_cast<selabel_handle*>(handle), &label_, path.c_str(),
                       static_cast<int>(mode)) != 0) {
      label_ = nullptr;
    }
    setfscreatecon(label_);
  }
  ~CreationLabel() {
    const android::base::ErrnoRestorer keep_errno;
    freecon(label_);
    setfscreatecon(nullptr);
  }
  CreationLabel(const CreationLabel&) = delete;
  CreationLabel& operator=(const CreationLabel&) = delete;

 private:
  char* label_ = nullptr;
};

bool make_directory(const std::string& path, mode_t mode, const selabel_handle* sehandle) {
  if (sehandle == nullptr) {
    return mkdir(path.c_str(), mode) == 0;
  }
  const CreationLabel label(sehandle, path, mode);
  return mkdir(path.c_str(), mode) == 0;
}

}  // namespace

bool ZunoFunc::Recursive_Mkdir(const std::string& path) {
  std::string prefix;
  for (const std::string& piece : Split_String(path, "/", true)) {
    prefix += "/" + piece;
    if (!Path_Exists(prefix) && mkdir(prefix.c_str(), 0777) != 0) {
      const android::base::ErrnoRestorer keep_errno;
      fprintf(stdout, "[%s]E: create_folder_strerr=Can not create %s folder (%s)\n", kLogTag,
              prefix.c_str(), strerror(errno));
      return false;
    }
  }
  return true;
}

bool ZunoFunc::Recursive_Mkdir(const std::string& path, unsigned int mode, bool parent_only,
                               const selabel_handle* sehandle) {
  const size_t last_slash = path.rfind('/');
  if (path.empty() || (parent_only && last_slash == std::string::npos)) {
    errno = ENOENT;
    return false;
  }
  const std::string chain = parent_only ? path.substr(0, last_slash + 1) : path + "/";
  const int chain_status = Dir_Status(chain);
  if (chain_status != kStatusAbsent) {
    return chain_status == kStatusDirectory;
  }
  for (size_t slash = chain.find('/', 1); slash != std::string::npos;
       slash = chain.find('/', slash + 1)) {
    const std::string prefix = chain.substr(0, slash);
    const int status = Dir_Status(prefix);
    if (status != kStatusDirectory &&
        (status != kStatusAbsent || !make_directory(prefix, mode, sehandle))) {
      return false;
    }
  }
  return true;
}

bool ZunoFunc::Create_Dir_Recursive(const std::string& path, unsigned int mode, unsigned int owner,
                                    unsigned int group) {
  std::string prefix;
  for (const std::string& piece : Split_String(path, "/", true)) {
    prefix += "/" + piece;
    if (Dir_Status(prefix) == kStatusDirectory) {
      continue;
    }
    // The mode is set again because the process's umask was taken off it.
    if (mkdir(prefix.c_str(), mode) != 0 || chmod(prefix.c_str(), mode) != 0 ||
        chown(prefix.c_str(), owner, group) != 0) {
      return false;
    }
  }
  return true;
}
