#pragma once

#include <atomic>
#include <memory>

#include "binder/Binder.h"
#include "common/export.h"
#include "platform/linux/binder/driver.h"
#include "platform/linux/binder/proxy_table.h"

namespace sentrova::binder {

// What stands behind ProcessState.
struct ProcessContext {
  explicit ProcessContext(std::unique_ptr<Driver> opened)
      : kernel(std::move(opened)), driver(kernel.get()), proxies(kernel.get()) {}

  const std::unique_ptr<Driver> kernel;
  std::atomic<Driver*> driver;  // null without a driver, and in a child after fork
  ProxyTable proxies;
  std::atomic<bool> pool_started = false;
  android::sp<android::BBinder> context_object;  // set before the first thread serves calls
};

// Sets the driver of this process in place of the kernel's. For tests that play the kernel; without
// effect after the first call of ProcessState::self().
SENTROVA_API void use_driver(std::unique_ptr<Driver> driver);

// To be called after the calling thread used `driver` outside its IPCThreadState: the driver is
// told of the thread's end.
void note_driver_use(Driver& driver);

}  // namespace sentrova::binder
