#include <android-base/errno_restorer.h>
#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>

#include "toolkit/log_tag.h"
#include "toolkit/zuno_func.h"

using sentrova::toolkit::kLogTag;

bool ZunoFunc::overwrite_with_zeros(int fd, long start, long length) {
  const off_t position = lseek(fd, start, SEEK_SET);
  if (position < 0 || position != start) {
    const android::base::ErrnoRestorer keep_errno;
    fprintf(stdout, "[%s]E: Seek failed for zero overwrite: (%s)\n", kLogTag, strerror(errno));
    return false;
  }
  static constexpr char kZeros[1024] = {};
  while (length > 0) {
    const size_t count = static_cast<size_t>(std::min<long>(length, sizeof(kZeros)));
    // An interrupted write ends the run like any other that fails: the caller decides what then.
    const ssize_t written = write(fd, kZeros, count);
    if (written < 1) {
      const android::base::ErrnoRestorer keep_errno;
      fprintf(stdout, "[%s]E: Write of zeroes failed: (%s)\n", kLogTag, strerror(errno));
      return false;
    }
    length -= written;
  }
  return true;
}
