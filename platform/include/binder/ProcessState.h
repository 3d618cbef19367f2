#pragma once

#include <stddef.h>
#include <stdint.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>

#include <memory>

#include "common/export.h"

namespace sentrova::binder {
struct ProcessContext;
}

namespace android {

class IBinder;

// This process's connection to the binder driver, made once and never closed. Without a driver the
// connection exists all the same and every use of it ends with NO_INIT or null. A child made by
// fork() has no connection. All functions may be called on any thread.
class SENTROVA_API ProcessState : public virtual RefBase {
 public:
  // The connection, opened through /dev/binder the first time. Never null.
  static sp<ProcessState> self();

  // As self(), with another device node. Too late, and without effect, after the first call.
  static sp<ProcessState> initWithDriver(const char* driver_path);

  // Whether there is a driver to talk to.
  bool hasDriver() const;

  // The context manager's proxy, or null if there is no driver or no manager yet.
  sp<IBinder> getContextObject(const sp<IBinder>& caller);

  // Makes this process the context manager; false, with errno set, if another process is (EBUSY) or
  // there is no driver (ENODEV). Its calls go to IPCThreadState::setTheContextObject's object.
  bool becomeContextManager();

  // Starts the first thread that serves calls; the driver asks for more as they are needed.
  void startThreadPool();

  // How many threads the driver may ask for beyond the first (15 if never called). OK, NO_INIT, or
  // the driver's error.
  status_t setThreadPoolMaxThreadCount(size_t max_threads);

  // Starts one more serving thread, if the pool was started. `is_main` is false for a thread that
  // the driver asked for.
  void spawnPooledThread(bool is_main);

  // The one proxy for a handle of this process; null without a driver, for a negative handle, or
  // when the driver refuses the references.
  sp<IBinder> getStrongProxyForHandle(int32_t handle);

  // For this library's own sources.
  sentrova::binder::ProcessContext& context() { return *context_; }

 protected:
  ~ProcessState() override;

 private:
  explicit ProcessState(const char* driver_path);

  const std::unique_ptr<sentrova::binder::ProcessContext> context_;
};

}  // namespace android
