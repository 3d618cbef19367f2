#pragma once

#include <signal.h>

namespace sentrova::testing {

// Sets what a signal does until destruction. A handler runs without SA_RESTART, so that the signal
// interrupts system calls.
class ScopedSignalAction {
 public:
  ScopedSignalAction(int signal, void (*handler)(int));
  ~ScopedSignalAction();
  ScopedSignalAction(const ScopedSignalAction&) = delete;
  ScopedSignalAction& operator=(const ScopedSignalAction&) = delete;

 private:
  int signal_;
  struct sigaction former_ = {};
};

// Interrupts this process's system calls every 20 milliseconds (SIGALRM) until destruction.
class RepeatedInterruption {
 public:
  RepeatedInterruption();
  ~RepeatedInterruption();
  RepeatedInterruption(const RepeatedInterruption&) = delete;
  RepeatedInterruption& operator=(const RepeatedInterruption&) = delete;

 private:
  ScopedSignalAction action_;
};

}  // namespace sentrova::testing
