// servicemanager: the device's directory of named services, as the binder driver's context manager.
// Serves until the device goes down; exit status 1 if it cannot.
#include <stdlib.h>

#include "binder/IPCThreadState.h"
#include "binder/ProcessState.h"
#include "platform/linux/servicemanager/service_directory.h"

using android::IPCThreadState;

int main() {
  const android::sp<android::ProcessState> process = android::ProcessState::self();
  // One thread does: no call takes long, and the calls need no order among themselves.
  if (process->setThreadPoolMaxThreadCount(0) != android::OK)
    return EXIT_FAILURE;
  if (!process->becomeContextManager())
    return EXIT_FAILURE;
  IPCThreadState* const thread = IPCThreadState::self();
  thread->setTheContextObject(
      new sentrova::ServiceDirectory([] { return IPCThreadState::self()->getCallingUid(); }));
  thread->joinThreadPool();
  return EXIT_FAILURE;
}
