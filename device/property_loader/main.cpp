// The property loader of the virtual device, a service that its init starts: see loader.h.

#include <android-base/logging.h>

#include "device/property_loader/loader.h"
#include "platform/linux/properties/property_watcher.h"

namespace {

constexpr std::chrono::milliseconds kWithoutLimit(-1);

}  // namespace

int main(int, char** argv) {
  android::base::InitLogging(argv, android::base::StderrLogger);
  std::optional<sentrova::PropertyWatcher> watcher = sentrova::PropertyWatcher::create();
  if (!watcher) {
    PLOG(ERROR) << "cannot watch the properties";
    return 1;
  }
  sentrova::device::withdraw_answers();
  // A request may have come before the watcher was there, or be one that nobody answered.
  do {
    sentrova::device::answer_requests();
  } while (watcher->wait(kWithoutLimit));
  PLOG(ERROR) << "cannot watch the properties any longer";
  return 1;
}
