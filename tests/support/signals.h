#pragma once

#include <android-base/logging.h>
#include <signal.h>
#include <sys/time.h>

namespace sentrova::testing {

// Sets what a signal does until destruction. A handler runs without SA_RESTART, so that the signal
// interrupts system calls.
class ScopedSignalAction {
 public:
  ScopedSignalAction(int signal, void (*handler)(int)) : signal_(signal) {
    struct sigaction action = {};
    action.sa_handler = handler;
    CHECK(sigaction(signal_, &action, &former_) == 0);
  }
  ~ScopedSignalAction() { sigaction(signal_, &former_, nullptr); }
  ScopedSignalAction(const ScopedSignalAction&) = delete;
  ScopedSignalAction& operator=(const ScopedSignalAction&) = delete;

 private:
  const int signal_;
  struct sigaction former_ = {};
};

// Interrupts this process's system calls every 20 milliseconds (SIGALRM) until destruction.
class RepeatedInterruption {
 public:
  RepeatedInterruption() { repeat_alarm(20'000); }
  ~RepeatedInterruption() { repeat_alarm(0); }
  RepeatedInterruption(const RepeatedInterruption&) = delete;
  RepeatedInterruption& operator=(const RepeatedInterruption&) = delete;

 private:
  static void repeat_alarm(suseconds_t microseconds) {
    const itimerval timer = {.it_interval = {0, microseconds}, .it_value = {0, microseconds}};
    CHECK(setitimer(ITIMER_REAL, &timer, nullptr) == 0);
  }

  const ScopedSignalAction action_{SIGALRM, [](int) {}};
};

}  // namespace sentrova::testing
