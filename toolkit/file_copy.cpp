#include "toolkit/file_copy.h"

#include <android-base/file.h>
#include <android-base/macros.h>
#include <errno.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <limits>
#include <memory>

using android::base::borrowed_fd;

namespace sentrova::toolkit {
namespace {

// Each of these copies at most `length` bytes between the descriptors' positions and returns how
// many it copied; it stops short only at the end of the source or at an error.

off_t copy_by_reading(borrowed_fd source, borrowed_fd destination, off_t length) {
  // The kernel copies to and from whole pages a sixth faster than across their ends.
  struct alignas(4096) Buffer {
    char bytes[256 * 1024];
  };
  const auto buffer = std::make_unique_for_overwrite<Buffer>();
  off_t copied = 0;
  while (copied < length) {
    const off_t wanted = std::min<off_t>(length - copied, sizeof(buffer->bytes));
    const ssize_t count =
        TEMP_FAILURE_RETRY(read(source.get(), buffer->bytes, static_cast<size_t>(wanted)));
    if (count <= 0 ||
        !android::base::WriteFully(destination, buffer->bytes, static_cast<size_t>(count))) {
      break;
    }
    copied += count;
  }
  return copied;
}

off_t copy_in_kernel(borrowed_fd source, borrowed_fd destination, off_t length) {
  constexpr off_t kLongestCall = off_t{1} << 30;
  off_t copied = 0;
  while (copied < length) {
    const size_t wanted = static_cast<size_t>(std::min(length - copied, kLongestCall));
    const ssize_t count = TEMP_FAILURE_RETRY(
        copy_file_range(source.get(), nullptr, destination.get(), nullptr, wanted, 0));
    if (count <= 0) {
      break;
    }
    copied += count;
  }
  return copied;
}

off_t copy_range(borrowed_fd source, borrowed_fd destination, off_t length) {
  const off_t copied = copy_in_kernel(source, destination, length);
  // The kernel's 0 may mean the end, or a file whose size does not show; its errors, two file
  // systems that do not go together. Reading on from here settles all of them.
  return copied + copy_by_reading(source, destination, length - copied);
}

// Returns the size of `source` if both are regular files and `source` has a hole, otherwise 0.
off_t size_if_holed(borrowed_fd source, borrowed_fd destination) {
  constexpr off_t kBlockSize = 512;  // the unit of st_blocks, see inode(7)
  struct stat from;
  struct stat to;
  if (fstat(source.get(), &from) != 0 || fstat(destination.get(), &to) != 0 ||
      !S_ISREG(from.st_mode) || !S_ISREG(to.st_mode) ||
      from.st_blocks >= from.st_size / kBlockSize) {
    return 0;
  }
  const off_t hole = lseek(source.get(), 0, SEEK_HOLE);
  lseek(source.get(), 0, SEEK_SET);
  return hole >= 0 && hole < from.st_size ? from.st_size : 0;
}

void copy_around_holes(borrowed_fd source, borrowed_fd destination, off_t size) {
  for (off_t position = 0; position < size;) {
    const off_t data = lseek(source.get(), position, SEEK_DATA);
    if (data < 0 && errno == ENXIO) {  // nothing but a hole up to the end
      [[maybe_unused]] const int extended = ftruncate(destination.get(), size);
    }
    if (data < 0) {
      return;
    }
    position = lseek(source.get(), data, SEEK_HOLE);
    if (position < 0 || lseek(source.get(), data, SEEK_SET) < 0 ||
        lseek(destination.get(), data, SEEK_SET) < 0 ||
        copy_range(source, destination, position - data) < position - data) {
      return;
    }
  }
}

}  // namespace

void copy_contents(borrowed_fd source, borrowed_fd destination) {
  const off_t holed_size = size_if_holed(source, destination);
  if (holed_size > 0) {
    copy_around_holes(source, destination, holed_size);
  } else {
    copy_range(source, destination, std::numeric_limits<off_t>::max());
  }
}

}  // namespace sentrova::toolkit
