#include "cli/service_client.h"

#include <binder/IServiceManager.h>
#include <utils/Errors.h>
#include <utils/String16.h>

#include <string>

#include "cli/progress.h"

namespace sentrova {
namespace {

ServiceConnection unavailable(std::string error) {
  return {.service = nullptr, .error = std::move(error)};
}

}  // namespace

ServiceConnection connect_to_service() {
  const Progress progress("waiting for the rescue service");
  const android::sp<android::IServiceManager> manager = android::defaultServiceManager();
  if (manager == nullptr) {
    return unavailable("no service manager answers (is /dev/binder there and servicemanager up?)");
  }
  const android::sp<android::IBinder> binder = manager->getService(android::String16(kServiceName));
  if (binder == nullptr) {
    return unavailable(std::string("no service named ") + kServiceName + " is registered");
  }
  if (binder->getInterfaceDescriptor() != android::ISentrovaService::descriptor) {
    return unavailable(std::string("what is registered as ") + kServiceName +
                       " is not the rescue service, or it died");
  }
  return {.service = android::ISentrovaService::asInterface(binder), .error = ""};
}

bool is_transport_status(int32_t answer) {
  return answer < -1;
}

std::string describe_transport_status(int32_t status) {
  switch (status) {
    case android::DEAD_OBJECT:
      return "the service died during the call";
    case android::FAILED_TRANSACTION:
      return "the kernel refused the call (is it too large?)";
    case android::NOT_ENOUGH_DATA:
      return "the service sent no result";
    default:
      return "the call failed with status " + std::to_string(status);
  }
}

}  // namespace sentrova
