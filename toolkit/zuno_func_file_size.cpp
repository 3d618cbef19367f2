#include <android-base/errno_restorer.h>
#include <android-base/strings.h>
#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <linux/fs.h>
#include <stdint.h>
#include <stdio.h>
#include <string.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include "toolkit/file_stream.h"
#include "toolkit/log_tag.h"
#include "toolkit/zuno_func.h"

using android::base::unique_fd;
using sentrova::toolkit::kLogTag;

namespace {

uint64_t block_device_size(const std::string& path) {
  const unique_fd device = sentrova::toolkit::open_to_read(path);
  uint64_t size_bytes = 0;
  const bool known = device.ok() && ioctl(device.get(), BLKGETSIZE64, &size_bytes) == 0;
  return known ? size_bytes : 0;
}

}  // namespace

uint64_t ZunoFunc::file_size(const std::string& path) {
  return android::base::StartsWithIgnoreCase(path, "/dev/block") ? block_device_size(path)
                                                                 : Get_File_Size(path);
}

bool ZunoFunc::empty_file(const std::string& path) {
  if (!Path_Exists(path)) {
    return false;
  }
  constexpr mode_t kCreationMode = 0644;
  const unique_fd file =
      sentrova::toolkit::open_file(path, O_RDWR | O_CREAT | O_TRUNC, kCreationMode);
  return file.ok();
}

bool ZunoFunc::resize_file(std::string path, unsigned long length) {
  if (path.empty()) {
    return false;
  }
  if (truncate(path.c_str(), static_cast<off_t>(length)) != 0) {
    const android::base::ErrnoRestorer keep_errno;
    fprintf(stdout, "[%s]E: Fail to resize file %s:%s\n", kLogTag, path.c_str(), strerror(errno));
    return false;
  }
  return true;
}
