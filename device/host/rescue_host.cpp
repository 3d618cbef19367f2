// The loading program of the rescue service: it loads the volume table, publishes one service
// object under its name and serves calls until it is killed.

#include <android-base/logging.h>
#include <binder/IPCThreadState.h>
#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>
#include <unistd.h>
#include <utils/String16.h>

#include <cstdio>
#include <cstring>

#include "device/host/timed_service.h"
#include "recovery_utils/roots.h"

namespace {

constexpr char kServiceName[] = "SentrovaService";

// Publishes the service again when the service manager has died and another one is there.
class Publisher : public android::IBinder::DeathRecipient {
 public:
  // Returns false, after saying why, when no service manager is there or it refuses.
  bool publish();

  void binderDied(const android::wp<android::IBinder>& /*who*/) override {
    LOG(WARNING) << "the service manager died";
    while (!publish()) {
      sleep(1);
    }
  }

 private:
  const android::sp<android::SentrovaService> service_ = new sentrova::device::TimedService();
};

bool Publisher::publish() {
  const android::sp<android::IServiceManager> manager = android::defaultServiceManager();
  if (manager == nullptr) {
    LOG(ERROR) << "cannot reach the service manager";
    return false;
  }
  const android::status_t status = manager->addService(android::String16(kServiceName), service_);
  if (status != android::NO_ERROR) {
    LOG(ERROR) << "cannot register " << kServiceName << ": " << strerror(-status) << " (" << status
               << ")";
    return false;
  }
  LOG(INFO) << kServiceName << " is registered";
  android::IInterface::asBinder(manager)->linkToDeath(this);
  return true;
}

}  // namespace

int main(int, char** argv) {
  android::base::InitLogging(argv, android::base::StderrLogger);
  // The service tells its steps on standard output; a log file must show them as they happen.
  setvbuf(stdout, nullptr, _IOLBF, 0);
  // Before the service is there: nothing guards the table.
  load_volume_table();
  const android::sp<Publisher> publisher = new Publisher();
  if (!publisher->publish()) {
    return 1;
  }
  android::ProcessState::self()->startThreadPool();
  android::IPCThreadState::self()->joinThreadPool();
  LOG(ERROR) << "the binder driver ended the conversation";
  return 1;
}
