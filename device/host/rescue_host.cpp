// The loading program of the rescue service: it publishes one service object under its name and
// serves calls until it is killed.

#include <android-base/logging.h>
#include <binder/IPCThreadState.h>
#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>
#include <utils/String16.h>

#include <cstdio>
#include <cstring>

#include "service/sentrova_service.h"

namespace {

constexpr char kServiceName[] = "SentrovaService";

// Returns false, after saying why, when no service manager is there or it refuses.
bool publish_service() {
  const android::sp<android::IServiceManager> manager = android::defaultServiceManager();
  if (manager == nullptr) {
    LOG(ERROR) << "cannot reach the service manager";
    return false;
  }
  const android::sp<android::SentrovaService> service = new android::SentrovaService();
  const android::status_t status = manager->addService(android::String16(kServiceName), service);
  if (status != android::NO_ERROR) {
    LOG(ERROR) << "cannot register " << kServiceName << ": " << strerror(-status) << " (" << status
               << ")";
    return false;
  }
  return true;
}

}  // namespace

int main(int, char** argv) {
  android::base::InitLogging(argv, android::base::StderrLogger);
  // The service tells its steps on standard output; a log file must show them as they happen.
  setvbuf(stdout, nullptr, _IOLBF, 0);
  if (!publish_service()) {
    return 1;
  }
  LOG(INFO) << kServiceName << " is registered";
  android::ProcessState::self()->startThreadPool();
  android::IPCThreadState::self()->joinThreadPool();
  LOG(ERROR) << "the binder driver ended the conversation";
  return 1;
}
