#pragma once

#include <sys/types.h>

#include <map>
#include <string>
#include <vector>

namespace sentrova::device {

struct ServiceDefinition {
  std::string name;
  std::vector<std::string> arguments;
  bool starts_with_device = true;  // false: only when it is asked for
};

// The long-running programs of the device. The state of each is told by the property
// "init.svc.NAME": "running" or "stopped". A service that dies is not started again. One thread.
class Services {
 public:
  // Each service's output goes to `log_directory`/NAME.log.
  Services(const std::vector<ServiceDefinition>& table, std::string log_directory);

  // Starts a service. Returns true when it runs, also when it did before; false when there is no
  // service of that name or it cannot be started, which is logged.
  bool start(const std::string& name);

  // Kills a service and its process group and reaps it. Returns true when it does not run
  // afterwards, false when there is no service of that name.
  bool stop(const std::string& name);

  // Takes note of a process that the caller has reaped. Returns true when it was a service's, whose
  // end is then logged.
  bool note_end(pid_t pid, int wait_status);

 private:
  struct Service {
    std::vector<std::string> arguments;
    pid_t pid = -1;  // -1: does not run
  };

  // The service of that name; nullptr, with a log line, when there is none.
  Service* find(const std::string& name);

  std::map<std::string, Service> services_;
  std::string log_directory_;
};

}  // namespace sentrova::device
