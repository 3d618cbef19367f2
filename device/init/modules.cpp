#include "device/init/modules.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/strings.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace sentrova::device {
namespace {

bool load_module(const std::string& path) {
  const android::base::unique_fd file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  return file.ok() && (syscall(SYS_finit_module, file.get(), "", 0) == 0 || errno == EEXIST);
}

}  // namespace

int load_modules(const std::string& directory) {
  std::string list;
  if (!android::base::ReadFileToString(directory + "/load.list", &list)) {
    PLOG(ERROR) << "cannot read the list of modules in " << directory;
    return 1;
  }
  int failures = 0;
  for (const std::string& name : android::base::Split(android::base::Trim(list), "\n")) {
    if (!load_module(directory + "/" + name)) {
      PLOG(ERROR) << "cannot load module " << name;
      ++failures;
    }
  }
  return failures;
}

}  // namespace sentrova::device
