#include <errno.h>
#include <pthread.h>
#include <string.h>

#include <mutex>
#include <utility>

#include "binder/BpBinder.h"
#include "binder/IPCThreadState.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"
#include "platform/linux/binder/log.h"
#include "platform/linux/binder/process_context.h"

namespace android {
namespace {

using sentrova::binder::Driver;
using sentrova::binder::kContextManagerHandle;
using sentrova::binder::ProcessContext;

constexpr const char* kDefaultDriver = "/dev/binder";
constexpr uint32_t kDefaultMaxThreads = 15;

// The process's connection. Never destroyed: threads of the pool use it until the very end.
struct Connection {
  std::mutex lock;
  ProcessState* state = nullptr;          // guarded by lock; holds one strong reference of its own
  std::unique_ptr<Driver> driver_to_use;  // guarded by lock
};

Connection& connection() {
  static auto* const the_connection = new Connection();
  return *the_connection;
}

// Set before the first fork handler can run and only read afterwards.
ProcessContext* context_to_abandon = nullptr;

void abandon_in_child() {
  context_to_abandon->driver = nullptr;
  context_to_abandon->proxies.abandon();
}

void* serve_calls(void* is_main) {
  IPCThreadState::self()->joinThreadPool(is_main != nullptr);
  return nullptr;
}

std::unique_ptr<Driver> driver_for(const char* path) {
  std::unique_ptr<Driver> given = std::move(connection().driver_to_use);
  return given != nullptr ? std::move(given) : sentrova::binder::open_kernel_driver(path);
}

}  // namespace

sp<ProcessState> ProcessState::self() {
  return initWithDriver(kDefaultDriver);
}

sp<ProcessState> ProcessState::initWithDriver(const char* driver_path) {
  Connection& shared = connection();
  const std::lock_guard guard(shared.lock);
  if (shared.state == nullptr) {
    const sp<ProcessState> made = new ProcessState(driver_path);
    made->incStrong(&shared);
    shared.state = made.get();
  }
  return shared.state;
}

ProcessState::ProcessState(const char* driver_path)
    : context_(std::make_unique<ProcessContext>(driver_for(driver_path))) {
  Driver* const driver = context_->driver;
  if (driver == nullptr)
    return;
  context_to_abandon = context_.get();
  pthread_atfork(nullptr, nullptr, abandon_in_child);
  const int result = driver->set_max_threads(kDefaultMaxThreads);
  if (result != 0)
    BINDER_LOGE("cannot set the number of threads: %s", strerror(-result));
}

ProcessState::~ProcessState() = default;

bool ProcessState::hasDriver() const {
  return context_->driver != nullptr;
}

sp<IBinder> ProcessState::getContextObject(const sp<IBinder>&) {
  // A manager that is not there yet must not leave a proxy behind that is known as dead.
  IPCThreadState* const thread = IPCThreadState::self();
  Parcel data;
  if (thread == nullptr ||
      thread->transact(kContextManagerHandle, IBinder::PING_TRANSACTION, data, nullptr, 0) != OK) {
    return nullptr;
  }
  return getStrongProxyForHandle(kContextManagerHandle);
}

bool ProcessState::becomeContextManager() {
  Driver* const driver = context_->driver;
  const int result = driver == nullptr ? -ENODEV : driver->become_context_manager();
  if (result == 0)
    return true;
  BINDER_LOGE("cannot become the context manager: %s", strerror(-result));
  errno = -result;
  return false;
}

void ProcessState::startThreadPool() {
  if (!context_->pool_started.exchange(true))
    spawnPooledThread(true);
}

status_t ProcessState::setThreadPoolMaxThreadCount(size_t max_threads) {
  Driver* const driver = context_->driver;
  if (driver == nullptr)
    return NO_INIT;
  if (max_threads > UINT32_MAX)
    return BAD_VALUE;
  return driver->set_max_threads(static_cast<uint32_t>(max_threads));
}

void ProcessState::spawnPooledThread(bool is_main) {
  if (!context_->pool_started || context_->driver == nullptr)
    return;
  pthread_t thread;
  const int error = pthread_create(&thread, nullptr, serve_calls, is_main ? this : nullptr);
  if (error != 0) {
    BINDER_LOGE("cannot start a serving thread: %s", strerror(error));
    return;
  }
  pthread_detach(thread);
}

sp<IBinder> ProcessState::getStrongProxyForHandle(int32_t handle) {
  return handle < 0 ? nullptr : context_->proxies.find_or_make(handle);
}

}  // namespace android

namespace sentrova::binder {

void use_driver(std::unique_ptr<Driver> driver) {
  android::Connection& shared = android::connection();
  const std::lock_guard guard(shared.lock);
  shared.driver_to_use = std::move(driver);
}

void note_driver_use(Driver& driver) {
  if (android::IPCThreadState::self() == nullptr)
    driver.exit_thread();
}

}  // namespace sentrova::binder
