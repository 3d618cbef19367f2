#pragma once

#include <android-base/unique_fd.h>
#include <sys/types.h>

#include <optional>
#include <string>

#include "device/init/power.h"
#include "device/init/services.h"
#include "platform/linux/properties/property_watcher.h"

namespace sentrova::device {

// What made the supervisor stop: the end of the main program, with its wait status, or a request
// for power off or reboot.
struct Ending {
  int main_wait_status = 0;
  std::optional<PowerRequest> power_request;
};

// Watches over the device while its main program (a story or a console) runs: reaps every process
// that ends, orphans included, and answers the properties "ctl.start" and "ctl.stop" (the value
// names a service) and "sys.powerctl". One thread.
//
// Requests under different property names are all answered, in their order. The store holds one
// value a name: of two values set under one name before the first was read, the last is answered.
class Supervisor {
 public:
  // Requests are seen from here on, and SIGCHLD is blocked in this thread. `services` must outlive
  // the supervisor. Returns nothing, with `errno`, without a property store to watch.
  static std::optional<Supervisor> create(Services& services);

  // Runs until the process `main_program`, a child of this one, has ended, or power off or reboot
  // is asked for. Returns nothing, with `errno`, when it cannot watch any longer.
  std::optional<Ending> run_until_end(pid_t main_program);

 private:
  Supervisor(Services& services, PropertyWatcher watcher, android::base::unique_fd child_signals);

  // Reaps all that has ended. Returns the main program's wait status if it is among them.
  std::optional<int> reap(pid_t main_program);
  // Answers all requests that have come, or those before one for power off or reboot, which it
  // hands back. Returns false with `errno` when it cannot watch any longer.
  bool answer_waiting(std::optional<PowerRequest>& power_request);
  // Answers these requests. Returns one for power off or reboot instead of obeying it.
  std::optional<PowerRequest> answer(const PropertyChanges& changes);

  Services* services_;
  PropertyWatcher watcher_;
  android::base::unique_fd child_signals_;
};

}  // namespace sentrova::device
