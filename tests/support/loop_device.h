#pragma once

#include <android-base/file.h>
#include <android-base/unique_fd.h>

#include <cstdint>
#include <initializer_list>
#include <string>

namespace sentrova::testing {

// A block device of `size_bytes` zeros over a temporary file, until destruction. It is let go even
// if something still has it mounted then, as soon as that ends.
class LoopDevice {
 public:
  explicit LoopDevice(int64_t size_bytes);

  // Its node; empty where the machine refuses to make one.
  const std::string& path() const { return path_; }

  // Makes an ext4 file system on it, without checksums, so that a test can change a word of the
  // superblock, and with spare superblocks. Returns whether it is made. On the device only.
  bool make_ext4() const;

 private:
  TemporaryFile file_;
  std::string path_;
  android::base::unique_fd device_;
};

// Reads `length` bytes at an offset of a device, and not what the kernel kept from earlier reads:
// the storage may have changed through another device over it. Empty on any failure.
std::string read_device(const std::string& path, int64_t offset, size_t length);

// Writes all bytes at an offset of a device, through to its storage. False on any failure.
bool write_device(const std::string& path, int64_t offset, const std::string& bytes);

// Runs a program to its end; its exit status, or -1 if it could not be run or was killed.
int run_program(std::initializer_list<std::string> arguments);

}  // namespace sentrova::testing
