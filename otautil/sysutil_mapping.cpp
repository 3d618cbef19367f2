#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <limits>
#include <utility>

#include "otautil/sysutil.h"

namespace {

using android::base::unique_fd;

// Without waiting: a pipe under the name would keep the caller.
unique_fd open_to_read(const std::string& path) {
  unique_fd file;
  do {
    file.reset(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  } while (file < 0 && errno == EINTR);
  return file;
}

// Address space that nothing else takes, given back on destruction with all that was mapped in it.
class Reservation {
 public:
  explicit Reservation(size_t size)
      : addr_(mmap(nullptr, size, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0)), size_(size) {}
  ~Reservation() {
    if (is_valid()) {
      munmap(addr_, size_);
    }
  }
  Reservation(const Reservation&) = delete;
  Reservation& operator=(const Reservation&) = delete;

  bool is_valid() const { return addr_ != MAP_FAILED; }
  unsigned char* addr() const { return static_cast<unsigned char*>(addr_); }
  void keep() { addr_ = MAP_FAILED; }

 private:
  void* addr_;
  const size_t size_;
};

// The size in bytes up to which a device can be mapped: pages that begin before its end. Negative,
// with errno set, if it has no size.
off64_t mappable_size(int device) {
  const off64_t page_size = sysconf(_SC_PAGESIZE);
  const off64_t size = lseek64(device, 0, SEEK_END);
  if (size > std::numeric_limits<off64_t>::max() - (page_size - 1)) {
    return size;
  }
  return size < 0 ? size : (size + page_size - 1) / page_size * page_size;
}

// Finds the bytes of a block range, of which the file may use the first `used_bytes` only. Returns
// false, with errno set, if the device does not have all that it uses: mapped all the same, they
// would raise SIGBUS when they are read.
bool find_bytes(const RangeSet::Range& range, uint32_t block_size, uint64_t used_bytes,
                off64_t device_size, off64_t& offset, size_t& length) {
  off64_t end = 0;
  if (__builtin_mul_overflow(range.first, block_size, &offset) ||
      __builtin_mul_overflow(range.second, block_size, &end) ||
      __builtin_sub_overflow(end, offset, &length)) {
    errno = EOVERFLOW;
    return false;
  }
  if (device_size < 0) {
    return false;
  }
  if (offset > device_size ||
      std::min<uint64_t>(length, used_bytes) > static_cast<uint64_t>(device_size - offset)) {
    errno = ENXIO;
    return false;
  }
  return true;
}

}  // namespace

MemMapping::~MemMapping() {
  unmap();
}

MemMapping::MemMapping(MemMapping&& other) noexcept {
  *this = std::move(other);
}

MemMapping& MemMapping::operator=(MemMapping&& other) noexcept {
  if (this != &other) {
    unmap();
    addr = std::exchange(other.addr, nullptr);
    length = std::exchange(other.length, 0);
    mapped_ranges.swap(other.mapped_ranges);
  }
  return *this;
}

void MemMapping::unmap() {
  for (const auto& [range_addr, range_length] : mapped_ranges) {
    if (munmap(range_addr, range_length) != 0) {
      PLOG(ERROR) << "Failed to munmap(" << range_addr << ", " << range_length << ")";
    }
  }
  mapped_ranges.clear();
  addr = nullptr;
  length = 0;
}

bool MemMapping::MapFile(const std::string& filename) {
  unmap();
  if (filename.empty()) {
    LOG(ERROR) << "Empty filename";
    return false;
  }
  bool is_mapped = false;
  if (filename[0] == '@') {
    is_mapped = MapBlockFile(filename.substr(1));
  } else {
    const unique_fd file = open_to_read(filename);
    if (file < 0) {
      PLOG(ERROR) << "Unable to open '" << filename << "'";
      return false;
    }
    is_mapped = MapFD(file.get());
  }
  if (!is_mapped) {
    LOG(ERROR) << "Map of '" << filename << "' failed";
  }
  return is_mapped;
}

bool MemMapping::MapFD(int fd) {
  unmap();
  struct stat64 status = {};
  if (fstat64(fd, &status) != 0) {
    PLOG(ERROR) << "fstat(" << fd << ") failed";
    return false;
  }
  const auto size = static_cast<size_t>(status.st_size);
  void* const memory = mmap(nullptr, size, PROT_READ, MAP_PRIVATE, fd, 0);
  if (memory == MAP_FAILED) {
    PLOG(ERROR) << "mmap(" << size << ", R, PRIVATE, " << fd << ", 0) failed";
    return false;
  }
  addr = static_cast<unsigned char*>(memory);
  length = size;
  mapped_ranges.push_back({memory, size});
  return true;
}

bool MemMapping::MapBlockFile(const std::string& map_path) {
  unmap();
  const BlockMapData map = BlockMapData::ParseBlockMapFile(map_path);
  if (!map) {
    return false;
  }
  const auto size = static_cast<size_t>(map.blocks_needed() * map.block_size);
  Reservation reservation(size);
  if (!reservation.is_valid()) {
    PLOG(ERROR) << "failed to reserve address space";
    return false;
  }
  const unique_fd device = open_to_read(map.device_path);
  if (device < 0) {
    PLOG(ERROR) << "failed to open block device " << map.device_path;
    return false;
  }
  if (!map_ranges(map, device.get(), reservation.addr(), size)) {
    mapped_ranges.clear();
    return false;
  }
  addr = reservation.addr();
  length = static_cast<size_t>(map.file_size);
  reservation.keep();
  LOG(INFO) << "mmapped " << mapped_ranges.size() << " ranges";
  return true;
}

bool MemMapping::map_ranges(const BlockMapData& map, int device, unsigned char* reservation,
                            size_t reservation_size) {
  const off64_t device_size = mappable_size(device);
  unsigned char* next = reservation;
  size_t remaining_size = reservation_size;
  mapped_ranges.reserve(map.block_ranges.size());
  for (const RangeSet::Range& range : map.block_ranges) {
    off64_t offset = 0;
    size_t size = 0;
    const uint64_t used_bytes = map.file_size - (reservation_size - remaining_size);
    if (!find_bytes(range, map.block_size, used_bytes, device_size, offset, size) ||
        mmap64(next, size, PROT_READ, MAP_PRIVATE | MAP_FIXED, device, offset) == MAP_FAILED) {
      PLOG(ERROR) << "failed to map range " << range.first << ": " << range.second;
      return false;
    }
    mapped_ranges.push_back({next, size});
    next += size;
    remaining_size -= size;
  }
  if (remaining_size != 0) {
    LOG(ERROR) << "Invalid ranges: remaining_size " << remaining_size;
    return false;
  }
  return true;
}
