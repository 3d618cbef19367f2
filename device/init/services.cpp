#include "device/init/services.h"

#include <android-base/logging.h>
#include <android-base/macros.h>
#include <android-base/properties.h>
#include <signal.h>
#include <sys/wait.h>

#include <utility>

#include "device/init/process.h"

namespace sentrova::device {
namespace {

void publish_state(const std::string& name, const char* state) {
  if (!android::base::SetProperty("init.svc." + name, state)) {
    PLOG(ERROR) << "cannot publish the state of service " << name;
  }
}

}  // namespace

Services::Services(const std::vector<ServiceDefinition>& table, std::string log_directory)
    : log_directory_(std::move(log_directory)) {
  for (const ServiceDefinition& definition : table) {
    services_[definition.name] = {definition.arguments};
  }
}

bool Services::start(const std::string& name) {
  Service* service = find(name);
  if (service == nullptr) {
    return false;
  }
  if (service->pid > 0) {
    return true;
  }
  service->pid = start_process({service->arguments, log_directory_ + "/" + name + ".log", ""});
  if (service->pid < 0) {
    PLOG(ERROR) << "cannot start service " << name;
    return false;
  }
  LOG(INFO) << "started service " << name << " as process " << service->pid;
  publish_state(name, "running");
  return true;
}

bool Services::stop(const std::string& name) {
  Service* service = find(name);
  if (service == nullptr) {
    return false;
  }
  if (service->pid > 0) {
    kill(-service->pid, SIGKILL);
    // Reaped here, so that a request to start it again finds it gone.
    int wait_status = 0;
    if (TEMP_FAILURE_RETRY(waitpid(service->pid, &wait_status, 0)) == service->pid) {
      note_end(service->pid, wait_status);
    }
  }
  return true;
}

bool Services::note_end(pid_t pid, int wait_status) {
  for (auto& [name, service] : services_) {
    if (service.pid == pid) {
      LOG(INFO) << "service " << name << " " << describe_wait_status(wait_status);
      service.pid = -1;
      publish_state(name, "stopped");
      return true;
    }
  }
  return false;
}

Services::Service* Services::find(const std::string& name) {
  const auto entry = services_.find(name);
  if (entry == services_.end()) {
    LOG(ERROR) << "there is no service " << name;
    return nullptr;
  }
  return &entry->second;
}

}  // namespace sentrova::device
