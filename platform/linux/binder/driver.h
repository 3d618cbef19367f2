#pragma once

#include <linux/android/binder.h>
#include <stddef.h>
#include <stdint.h>

#include <memory>
#include <span>

#include "common/export.h"

namespace sentrova::binder {

// The kernel's binder driver as seen from one process: everything that this library asks of it. All
// functions may be called on any thread and return 0 or a negative errno.
class SENTROVA_API Driver {
 public:
  virtual ~Driver();

  // Hands commands over and waits for returns (BINDER_WRITE_READ); either side may be empty. The
  // consumed counts are brought up to date even on failure, so that -EINTR is answered by calling
  // again with the same exchange.
  virtual int write_read(binder_write_read* exchange) = 0;

  // How many serving threads the driver may ask for.
  virtual int set_max_threads(uint32_t count) = 0;

  // Makes the process the context manager; -EBUSY if there is one.
  virtual int become_context_manager() = 0;

  // Forgets the calling thread.
  virtual int exit_thread() = 0;

  // Where the driver puts what the process receives; nothing outside it is believed.
  virtual std::span<const uint8_t> receive_area() const = 0;
};

// The driver behind the device node `path`: opened close-on-exec, its protocol version checked and
// its receive area mapped (not into children). Null, with the reason logged, on any failure.
SENTROVA_API std::unique_ptr<Driver> open_kernel_driver(const char* path);

// Hands `size` bytes of commands over without waiting for returns, retrying interrupted attempts. 0
// or a negative errno; -EPROTO if the driver claims to have consumed something else than all.
SENTROVA_API int write_commands(Driver& driver, const void* commands, size_t size);

}  // namespace sentrova::binder
