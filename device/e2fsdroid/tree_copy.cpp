#include "device/e2fsdroid/tree_copy.h"

#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <filesystem>
#include <map>
#include <system_error>
#include <utility>

namespace sentrova::device {
namespace {

namespace fs = std::filesystem;

using android::base::unique_fd;

bool report(bool done, const std::string& path) {
  if (!done) {
    fprintf(stderr, "e2fsdroid: %s: %s\n", path.c_str(), strerror(errno));
  }
  return done;
}

bool copy_content(const std::string& source, const std::string& target) {
  const unique_fd in(open(source.c_str(), O_RDONLY | O_CLOEXEC));
  const unique_fd out(open(target.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  if (in == -1 || out == -1) {
    return false;
  }
  constexpr size_t kAtOnce = 1 << 20;
  ssize_t sent = 0;
  do {
    sent = sendfile(out.get(), in.get(), nullptr, kAtOnce);
  } while (sent > 0 || (sent < 0 && errno == EINTR));
  return sent == 0;
}

bool copy_link(const std::string& source, const std::string& target) {
  std::string destination;
  return android::base::Readlink(source, &destination) &&
         symlink(destination.c_str(), target.c_str()) == 0;
}

// The names of the attributes, each with a NUL after it; empty where the file system has none.
bool list_attributes(const std::string& path, std::string& names) {
  names.resize(XATTR_LIST_MAX);
  const ssize_t length = llistxattr(path.c_str(), names.data(), names.size());
  names.resize(length > 0 ? static_cast<size_t>(length) : 0);
  return length >= 0 || errno == ENOTSUP;
}

bool copy_attributes(const std::string& source, const std::string& target) {
  std::string names;
  if (!list_attributes(source, names)) {
    return false;
  }
  std::string value;
  for (const char* name = names.c_str(); *name != '\0'; name += strlen(name) + 1) {
    value.resize(XATTR_SIZE_MAX);
    const ssize_t length = lgetxattr(source.c_str(), name, value.data(), value.size());
    if (length < 0 ||
        lsetxattr(target.c_str(), name, value.data(), static_cast<size_t>(length), 0) != 0) {
      return false;
    }
  }
  return true;
}

// In an order in which none undoes another: a change of owner clears mode bits and capabilities,
// and every change sets the time.
bool copy_metadata(const std::string& source, const std::string& target,
                   const struct stat& status) {
  if (lchown(target.c_str(), status.st_uid, status.st_gid) != 0 ||
      (!S_ISLNK(status.st_mode) && chmod(target.c_str(), status.st_mode & 07777) != 0) ||
      !copy_attributes(source, target)) {
    return false;
  }
  const timespec times[] = {status.st_atim, status.st_mtim};
  return utimensat(AT_FDCWD, target.c_str(), times, AT_SYMLINK_NOFOLLOW) == 0;
}

class TreeCopy {
 public:
  bool copy(const std::string& source, const std::string& target) {
    struct stat status = {};
    if (!report(lstat(source.c_str(), &status) == 0, source)) {
      return false;
    }
    if (S_ISDIR(status.st_mode)) {
      return copy_directory(source, target) &&
             report(copy_metadata(source, target, status), target);
    }
    if (status.st_nlink > 1) {
      const auto [first, is_new] = copied_.try_emplace({status.st_dev, status.st_ino}, target);
      if (!is_new) {
        return report(link(first->second.c_str(), target.c_str()) == 0, target);
      }
    }
    return report(make(source, target, status) && copy_metadata(source, target, status), target);
  }

 private:
  bool copy_directory(const std::string& source, const std::string& target) {
    if (!report(mkdir(target.c_str(), 0700) == 0 || errno == EEXIST, target)) {
      return false;
    }
    std::error_code error;
    for (fs::directory_iterator at(source, error), end; !error && at != end; at.increment(error)) {
      const std::string name = at->path().filename();
      if (!copy(source + "/" + name, target + "/" + name)) {
        return false;
      }
    }
    errno = error.value();
    return report(!error, source);
  }

  static bool make(const std::string& source, const std::string& target,
                   const struct stat& status) {
    if (S_ISREG(status.st_mode)) {
      return copy_content(source, target);
    }
    if (S_ISLNK(status.st_mode)) {
      return copy_link(source, target);
    }
    return mknod(target.c_str(), status.st_mode, status.st_rdev) == 0;
  }

  // Where the first name of a file with several went.
  std::map<std::pair<dev_t, ino_t>, std::string> copied_;
};

}  // namespace

bool copy_tree(const std::string& source, const std::string& target) {
  return TreeCopy().copy(source, target);
}

}  // namespace sentrova::device
