#include "platform/linux/binder/driver.h"

#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <utility>

#include "platform/linux/binder/log.h"

namespace sentrova::binder {
namespace {

using android::base::unique_fd;

// What one process may have received and not yet given back. The two pages are left for the guards
// that the kernel puts around a mapping, so that together they stay within 1 MiB.
constexpr size_t kReceiveAreaMegabyte = 1024 * 1024;

size_t receive_area_size() {
  return kReceiveAreaMegabyte - 2 * static_cast<size_t>(sysconf(_SC_PAGESIZE));
}

class Mapping {
 public:
  Mapping(int fd, size_t size)
      : address_(mmap(nullptr, size, PROT_READ, MAP_PRIVATE | MAP_NORESERVE, fd, 0)), size_(size) {}
  Mapping(Mapping&& other) noexcept
      : address_(std::exchange(other.address_, MAP_FAILED)), size_(other.size_) {}
  ~Mapping() {
    if (ok())
      munmap(address_, size_);
  }
  Mapping& operator=(Mapping&&) = delete;

  bool ok() const { return address_ != MAP_FAILED; }
  bool keep_from_children() { return madvise(address_, size_, MADV_DONTFORK) == 0; }
  std::span<const uint8_t> bytes() const { return {static_cast<const uint8_t*>(address_), size_}; }

 private:
  void* address_;
  size_t size_;
};

class KernelDriver final : public Driver {
 public:
  KernelDriver(unique_fd fd, Mapping mapping) : fd_(std::move(fd)), mapping_(std::move(mapping)) {}

  int write_read(binder_write_read* exchange) override {
    return control(BINDER_WRITE_READ, exchange);
  }
  int set_max_threads(uint32_t count) override { return control(BINDER_SET_MAX_THREADS, &count); }
  int become_context_manager() override {
    int32_t unused = 0;
    return control(BINDER_SET_CONTEXT_MGR, &unused);
  }
  int exit_thread() override {
    int32_t unused = 0;
    return control(BINDER_THREAD_EXIT, &unused);
  }
  std::span<const uint8_t> receive_area() const override { return mapping_.bytes(); }

 private:
  int control(unsigned long request, void* argument) {
    return ioctl(fd_.get(), request, argument) < 0 ? -errno : 0;
  }

  const unique_fd fd_;
  const Mapping mapping_;
};

std::unique_ptr<Driver> refuse(const char* path, const char* reason) {
  BINDER_LOGE("%s: %s", path, reason);
  return nullptr;
}

}  // namespace

Driver::~Driver() = default;

std::unique_ptr<Driver> open_kernel_driver(const char* path) {
  unique_fd fd(open(path, O_RDWR | O_CLOEXEC));
  if (!fd.ok())
    return refuse(path, strerror(errno));
  binder_version version = {};
  if (ioctl(fd.get(), BINDER_VERSION, &version) < 0)
    return refuse(path, strerror(errno));
  if (version.protocol_version != BINDER_CURRENT_PROTOCOL_VERSION) {
    return refuse(path, "the driver speaks another version of the protocol");
  }
  Mapping mapping(fd.get(), receive_area_size());
  if (!mapping.ok() || !mapping.keep_from_children())
    return refuse(path, strerror(errno));
  return std::make_unique<KernelDriver>(std::move(fd), std::move(mapping));
}

int write_commands(Driver& driver, const void* commands, size_t size) {
  binder_write_read exchange = {};
  exchange.write_buffer = reinterpret_cast<uintptr_t>(commands);
  exchange.write_size = size;
  int result;
  do {
    result = driver.write_read(&exchange);
  } while (result == -EINTR);
  return result == 0 && exchange.write_consumed != size ? -EPROTO : result;
}

}  // namespace sentrova::binder
