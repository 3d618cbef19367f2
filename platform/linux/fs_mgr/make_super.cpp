// Lays out a super partition (or an image of one) anew: writes its tables and, where a file is
// given, the beginning of a logical partition.
//
//   make_super DEVICE NAME=SIZE[:FILE]...
//
// SIZE is in bytes, or with K, M or G behind it. Slices follow each other, each on a whole
// mebibyte. Exit status: 0 done; 1 it could not be done, and what was in super may be lost; 2 a
// wrong command line.

#include <android-base/file.h>
#include <android-base/parseint.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <cerrno>

#include "platform/linux/fs_mgr/super_table.h"

namespace {

using android::base::unique_fd;
using namespace sentrova::fs_mgr;

constexpr int kUsageStatus = 2;
constexpr uint64_t kAlignmentSectors = 2048;
// Small enough that sums of a slice's end and the alignment do not wrap.
constexpr uint64_t kMostBytes = uint64_t{1} << 50;
constexpr size_t kCopyBytes = 1 << 20;

struct Layout {
  std::vector<LogicalPartition> slices;
  std::vector<std::string> files;  // one for each slice; empty: none
};

int fail(const std::string& text) {
  fprintf(stderr, "make_super: %s\n", text.c_str());
  return 1;
}

uint64_t next_start(const Layout& layout) {
  const uint64_t end = layout.slices.empty()
                           ? kFirstDataSector
                           : layout.slices.back().start_sector + layout.slices.back().sectors;
  return (end + kAlignmentSectors - 1) / kAlignmentSectors * kAlignmentSectors;
}

bool add_slice(const std::string& word, Layout& layout) {
  const size_t equals = word.find('=');
  const size_t colon = word.find(':', equals);
  uint64_t bytes = 0;
  if (equals == std::string::npos ||
      !android::base::ParseByteCount(word.substr(equals + 1, colon - equals - 1), &bytes,
                                     kMostBytes) ||
      bytes % kSuperSectorBytes != 0) {
    return false;
  }
  layout.slices.push_back({word.substr(0, equals), next_start(layout), bytes / kSuperSectorBytes});
  layout.files.push_back(colon == std::string::npos ? "" : word.substr(colon + 1));
  return true;
}

bool write_at(int device, uint64_t offset, std::string_view bytes) {
  return lseek64(device, static_cast<off64_t>(offset), SEEK_SET) >= 0 &&
         android::base::WriteFully(device, bytes.data(), bytes.size());
}

bool fill_slice(int device, const LogicalPartition& slice, const std::string& file) {
  const unique_fd source(open(file.c_str(), O_RDONLY | O_CLOEXEC));
  const uint64_t slice_offset = slice.start_sector * kSuperSectorBytes;
  const uint64_t slice_bytes = slice.sectors * kSuperSectorBytes;
  std::string buffer(kCopyBytes, '\0');
  for (uint64_t done = 0;;) {
    const ssize_t count = TEMP_FAILURE_RETRY(read(source.get(), buffer.data(), buffer.size()));
    if (count <= 0) {
      return count == 0;
    }
    const auto length = static_cast<size_t>(count);
    if (length > slice_bytes - done) {
      errno = EFBIG;
      return false;
    }
    if (!write_at(device, slice_offset + done, {buffer.data(), length})) {
      return false;
    }
    done += length;
  }
}

bool write_tables(int device, const std::vector<LogicalPartition>& slices) {
  const std::string table = encode_super_table(slices);
  return write_at(device, 0, table + table) && fsync(device) == 0;
}

int make_super(const std::string& path, const Layout& layout) {
  const unique_fd device(open(path.c_str(), O_RDWR | O_CLOEXEC));
  const off64_t size_bytes = device.ok() ? lseek64(device.get(), 0, SEEK_END) : -1;
  if (size_bytes < 0) {
    return fail(path + ": " + strerror(errno));
  }
  const std::string problem =
      check_slices(layout.slices, static_cast<uint64_t>(size_bytes) / kSuperSectorBytes);
  if (!problem.empty()) {
    return fail(path + ": " + problem);
  }
  for (size_t i = 0; i < layout.slices.size(); ++i) {
    if (!layout.files[i].empty() && !fill_slice(device.get(), layout.slices[i], layout.files[i])) {
      return fail(layout.files[i] + ": " + strerror(errno));
    }
  }
  return write_tables(device.get(), layout.slices) ? 0 : fail(path + ": " + strerror(errno));
}

}  // namespace

int main(int argc, char** argv) {
  Layout layout;
  bool usable = argc > 1;
  for (int i = 2; usable && i < argc; ++i) {
    usable = add_slice(argv[i], layout);
  }
  if (!usable) {
    fprintf(stderr, "usage: make_super DEVICE NAME=SIZE[:FILE]...\n");
    return kUsageStatus;
  }
  return make_super(argv[1], layout);
}
