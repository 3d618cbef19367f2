// The smallest loading program: it loads the volume table, publishes the rescue service under its
// name and serves calls until it is killed. Runs as root, beside a service manager.

#include <binder/IPCThreadState.h>
#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>
#include <utils/String16.h>

#include <cstdio>
#include <cstring>

#include "recovery_utils/roots.h"
#include "service/sentrova_service.h"

int main() {
  // The service tells its steps on standard output; a log file must show them as they happen.
  setvbuf(stdout, nullptr, _IOLBF, 0);

  // Before the service is there: nothing guards the table. This mounts /data where it can.
  load_volume_table();

  const android::sp<android::IServiceManager> manager = android::defaultServiceManager();
  if (manager == nullptr) {
    fprintf(stderr, "host: no service manager answers\n");
    return 1;
  }
  const android::sp<android::SentrovaService> service = new android::SentrovaService();
  const android::status_t status =
      manager->addService(android::String16("SentrovaService"), service);
  if (status != android::OK) {
    fprintf(stderr, "host: the service is not registered: %s\n", strerror(-status));
    return 1;
  }

  android::ProcessState::self()->startThreadPool();
  android::IPCThreadState::self()->joinThreadPool();
  fprintf(stderr, "host: the binder driver ended the conversation\n");
  return 1;
}
