#include "device/init/supervisor.h"

#include <android-base/logging.h>
#include <android-base/properties.h>
#include <poll.h>
#include <signal.h>
#include <sys/signalfd.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <utility>

namespace sentrova::device {
namespace {

constexpr char kStartRequest[] = "ctl.start";
constexpr char kStopRequest[] = "ctl.stop";
constexpr char kPowerRequest[] = "sys.powerctl";

android::base::unique_fd open_child_signals() {
  sigset_t child_ended;
  sigemptyset(&child_ended);
  sigaddset(&child_ended, SIGCHLD);
  sigprocmask(SIG_BLOCK, &child_ended, nullptr);
  return android::base::unique_fd(signalfd(-1, &child_ended, SFD_CLOEXEC | SFD_NONBLOCK));
}

std::optional<PowerRequest> requested_power() {
  const std::string value = android::base::GetProperty(kPowerRequest, "");
  std::optional<PowerRequest> request = parse_power_request(value);
  if (!request && !value.empty()) {
    LOG(ERROR) << "unknown power request: " << value;
  }
  return request;
}

}  // namespace

std::optional<Supervisor> Supervisor::create(Services& services) {
  android::base::unique_fd child_signals = open_child_signals();
  std::optional<PropertyWatcher> watcher = PropertyWatcher::create();
  if (!child_signals.ok() || !watcher) {
    return std::nullopt;
  }
  return Supervisor(services, std::move(*watcher), std::move(child_signals));
}

Supervisor::Supervisor(Services& services, PropertyWatcher watcher,
                       android::base::unique_fd child_signals)
    : services_(&services),
      watcher_(std::move(watcher)),
      child_signals_(std::move(child_signals)) {}

std::optional<Ending> Supervisor::run_until_end(pid_t main_program) {
  while (true) {
    pollfd sources[] = {{child_signals_.get(), POLLIN, 0}, {watcher_.fd(), POLLIN, 0}};
    if (poll(sources, std::size(sources), -1) < 0 && errno != EINTR) {
      return std::nullopt;
    }
    // Requests are read after the ends, so that what a program asked for before it ended is
    // answered.
    const std::optional<int> main_wait_status = reap(main_program);
    Ending ending = {main_wait_status.value_or(0), std::nullopt};
    if (!answer_waiting(ending.power_request)) {
      return std::nullopt;
    }
    if (ending.power_request || main_wait_status) {
      return ending;
    }
  }
}

std::optional<int> Supervisor::reap(pid_t main_program) {
  // One signal may stand for many ends: drained first, so that none comes unseen after the loop.
  signalfd_siginfo ignored;
  while (read(child_signals_.get(), &ignored, sizeof(ignored)) > 0) {
  }
  std::optional<int> main_wait_status;
  int wait_status = 0;
  for (pid_t pid = waitpid(-1, &wait_status, WNOHANG); pid > 0;
       pid = waitpid(-1, &wait_status, WNOHANG)) {
    if (pid == main_program) {
      main_wait_status = wait_status;
    } else {
      services_->note_end(pid, wait_status);
    }
  }
  return main_wait_status;
}

bool Supervisor::answer_waiting(std::optional<PowerRequest>& power_request) {
  pollfd waiting = {watcher_.fd(), POLLIN, 0};
  while (!power_request && poll(&waiting, 1, 0) > 0) {
    const std::optional<PropertyChanges> changes = watcher_.wait(std::chrono::milliseconds(0));
    if (!changes) {
      return false;
    }
    power_request = answer(*changes);
  }
  return true;
}

std::optional<PowerRequest> Supervisor::answer(const PropertyChanges& changes) {
  if (changes.rescan) {
    LOG(ERROR) << "requests to start or stop services may have been lost";
    if (std::optional<PowerRequest> request = requested_power()) {
      return request;
    }
  }
  for (const std::string& name : changes.names) {
    if (name == kStartRequest) {
      services_->start(android::base::GetProperty(name, ""));
    } else if (name == kStopRequest) {
      services_->stop(android::base::GetProperty(name, ""));
    } else if (name == kPowerRequest) {
      if (std::optional<PowerRequest> request = requested_power()) {
        return request;
      }
    }
  }
  return std::nullopt;
}

}  // namespace sentrova::device
