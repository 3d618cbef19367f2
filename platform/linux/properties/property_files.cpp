#include "platform/linux/properties/property_files.h"

#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "platform/linux/properties/property_rules.h"

namespace sentrova {
namespace {

using android::base::unique_fd;

// A value on its way into the store, under a name that no property can have (a leading dot).
class NewFile {
 public:
  explicit NewFile(const std::string& directory)
      : path_(directory + "/.new-XXXXXX"), fd_(mkostemp(path_.data(), O_CLOEXEC)) {}
  ~NewFile() {
    if (fd_.ok() && !gone_) {
      const int saved_errno = errno;
      unlink(path_.c_str());
      errno = saved_errno;
    }
  }
  NewFile(const NewFile&) = delete;
  NewFile& operator=(const NewFile&) = delete;

  bool write(const std::string& value) {
    constexpr mode_t kReadableByAll = 0644;
    return fd_.ok() && android::base::WriteStringToFd(value, fd_) &&
           fchmod(fd_.get(), kReadableByAll) == 0;
  }

  bool replace(const std::string& path) {
    gone_ = rename(path_.c_str(), path.c_str()) == 0;
    return gone_;
  }

  // Of several links to one name the kernel makes the first, whoever looked before.
  bool publish_once(const std::string& path) { return link(path_.c_str(), path.c_str()) == 0; }

 private:
  std::string path_;
  unique_fd fd_;
  bool gone_ = false;
};

}  // namespace

std::optional<std::string> read_property_file(const std::string& directory,
                                              const std::string& name) {
  const std::string path = directory + "/" + name;
  // O_NONBLOCK: a FIFO in the folder must not hold up its readers.
  const unique_fd fd(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  struct stat status = {};
  if (!fd.ok() || fstat(fd.get(), &status) != 0 || !S_ISREG(status.st_mode) ||
      status.st_size > static_cast<off_t>(max_value_bytes(name))) {
    return std::nullopt;
  }
  std::string value(static_cast<size_t>(status.st_size), '\0');
  if (!android::base::ReadFully(fd, value.data(), value.size()) ||
      !is_property_value(name, value)) {
    return std::nullopt;
  }
  return value;
}

bool write_property_file(const std::string& directory, const std::string& name,
                         const std::string& value) {
  const std::string path = directory + "/" + name;
  NewFile file(directory);
  if (!file.write(value)) {
    return false;
  }
  return is_read_only_property(name) ? file.publish_once(path) : file.replace(path);
}

}  // namespace sentrova
