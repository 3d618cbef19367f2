#include "tests/support/loop_device.h"

#include <fcntl.h>
#include <linux/fs.h>
#include <linux/loop.h>
#include <spawn.h>
#include <sys/ioctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <vector>

namespace sentrova::testing {

using android::base::unique_fd;

LoopDevice::LoopDevice(int64_t size_bytes) {
  const unique_fd control(open("/dev/loop-control", O_RDWR | O_CLOEXEC));
  const int number = control == -1 ? -1 : ioctl(control.get(), LOOP_CTL_GET_FREE);
  const std::string path = "/dev/loop" + std::to_string(number);
  device_.reset(open(path.c_str(), O_RDWR | O_CLOEXEC));
  loop_config config = {};
  config.fd = static_cast<uint32_t>(file_.fd);
  config.info.lo_flags = LO_FLAGS_AUTOCLEAR;
  if (device_ != -1 && ftruncate(file_.fd, size_bytes) == 0 &&
      ioctl(device_.get(), LOOP_CONFIGURE, &config) == 0) {
    path_ = path;
  }
}

bool LoopDevice::make_ext4() const {
  return run_program({"/system/bin/mke2fs", "-q", "-F", "-t", "ext4", "-b", "1024", "-O",
                      "^metadata_csum", path_}) == 0;
}

std::string read_device(const std::string& path, int64_t offset, size_t length) {
  const unique_fd device(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  std::string bytes(length, '\0');
  if (ioctl(device.get(), BLKFLSBUF) != 0 ||
      pread64(device.get(), bytes.data(), length, offset) != static_cast<ssize_t>(length)) {
    return "";
  }
  return bytes;
}

bool write_device(const std::string& path, int64_t offset, const std::string& bytes) {
  const unique_fd device(open(path.c_str(), O_WRONLY | O_CLOEXEC));
  return pwrite64(device.get(), bytes.data(), bytes.size(), offset) ==
             static_cast<ssize_t>(bytes.size()) &&
         fsync(device.get()) == 0;
}

int run_program(std::initializer_list<std::string> arguments) {
  std::vector<std::string> words(arguments);
  std::vector<char*> pointers;
  for (std::string& word : words) {
    pointers.push_back(word.data());
  }
  pointers.push_back(nullptr);
  pid_t child = -1;
  int status = 0;
  if (posix_spawn(&child, pointers[0], nullptr, nullptr, pointers.data(), environ) != 0 ||
      TEMP_FAILURE_RETRY(waitpid(child, &status, 0)) != child || !WIFEXITED(status)) {
    return -1;
  }
  return WEXITSTATUS(status);
}

}  // namespace sentrova::testing
