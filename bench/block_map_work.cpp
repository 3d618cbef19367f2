// What bench/block_map times, in the folder that it is run in. Exits with 1 if a limit is exceeded,
// with 2 if something fails.
#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <sys/mman.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <string>

#include "bench/side_by_side.h"
#include "otautil/sysutil.h"

namespace {

constexpr size_t kRanges = 10'000;
constexpr size_t kBlock = 4096;
constexpr size_t kBytes = kRanges * kBlock;
constexpr double kMapLimit = 1.2;
constexpr double kReadLimit = 1.1;

void expect(bool is_right) {
  if (!is_right) {
    std::puts("something failed");
    std::exit(2);
  }
}

// The device's block for each of the file's: no two in a row, which the kernel would join.
size_t device_block(size_t index) {
  return index * 7 % kRanges;
}

void write_files() {
  std::string map = std::filesystem::current_path().string() + "/device\n" +
                    std::to_string(kBytes) + " 4096\n" + std::to_string(kRanges) + "\n";
  std::string device(kBytes, '\0'), file;
  for (size_t i = 0; i < kRanges; ++i) {
    std::string block(kBlock, static_cast<char>(i));
    file += block;
    device.replace(device_block(i) * kBlock, kBlock, block);
    map += std::to_string(device_block(i)) + " " + std::to_string(device_block(i) + 1) + "\n";
  }
  expect(android::base::WriteStringToFile(map, "map") &&
         android::base::WriteStringToFile(device, "device") &&
         android::base::WriteStringToFile(file, "file"));
}

void map_bare() {
  const android::base::unique_fd device(open("device", O_RDONLY | O_CLOEXEC));
  void* const start = mmap(nullptr, kBytes, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  char* const memory = static_cast<char*>(start);
  for (size_t i = 0; i < kRanges; ++i) {
    expect(mmap(memory + i * kBlock, kBlock, PROT_READ, MAP_PRIVATE | MAP_FIXED, device.get(),
                static_cast<off_t>(device_block(i) * kBlock)) != MAP_FAILED);
  }
  for (size_t i = 0; i < kRanges; ++i) {
    expect(munmap(memory + i * kBlock, kBlock) == 0);
  }
}

uint64_t sum_of(const MemMapping& mapping) {
  uint64_t sum = 0;
  for (size_t i = 0; i < mapping.length; i += sizeof(uint64_t)) {
    uint64_t word = 0;
    std::memcpy(&word, mapping.addr + i, sizeof(word));
    sum += word * (i + 1);
  }
  return sum;
}

}  // namespace

int main() {
  using side_by_side::compare;
  android::base::SetMinimumLogSeverity(android::base::ERROR);
  write_files();
  const bool map_is_fast = compare(
      "map and unmap 10,000 ranges", kMapLimit,
      [] {
        MemMapping mapping;
        expect(mapping.MapFile("@map"));
      },
      map_bare);

  MemMapping by_map, plain;
  expect(by_map.MapFile("@map") && plain.MapFile("file"));
  const uint64_t sum = sum_of(plain);
  const bool read_is_fast = compare(
      "read 40 MB through the mapping", kReadLimit, [&] { expect(sum_of(by_map) == sum); },
      [&] { expect(sum_of(plain) == sum); });
  return map_is_fast && read_is_fast ? 0 : 1;
}
