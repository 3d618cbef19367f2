#include "tests/support/signals.h"

#include <android-base/logging.h>
#include <sys/time.h>

namespace sentrova::testing {
namespace {

void repeat_alarm(suseconds_t interval_microseconds) {
  const itimerval timer = {.it_interval = {0, interval_microseconds},
                           .it_value = {0, interval_microseconds}};
  CHECK(setitimer(ITIMER_REAL, &timer, nullptr) == 0);
}

}  // namespace

ScopedSignalAction::ScopedSignalAction(int signal, void (*handler)(int)) : signal_(signal) {
  struct sigaction action = {};
  action.sa_handler = handler;
  CHECK(sigaction(signal_, &action, &former_) == 0);
}

ScopedSignalAction::~ScopedSignalAction() {
  CHECK(sigaction(signal_, &former_, nullptr) == 0);
}

RepeatedInterruption::RepeatedInterruption() : action_(SIGALRM, [](int) {}) {
  constexpr suseconds_t kIntervalMicroseconds = 20'000;
  repeat_alarm(kIntervalMicroseconds);
}

RepeatedInterruption::~RepeatedInterruption() {
  repeat_alarm(0);
}

}  // namespace sentrova::testing
