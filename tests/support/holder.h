#pragma once

#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <functional>

namespace sentrova::testing {

// A process that has done `hold` and then waits, until destruction.
class Holder {
 public:
  explicit Holder(const std::function<void()>& hold) {
    android::base::unique_fd ready, waiting;
    EXPECT_TRUE(android::base::Pipe(&waiting, &ready));
    pid_ = fork();
    if (pid_ == 0) {
      hold();
      ready.reset();
      while (true) {
        pause();
      }
    }
    ready.reset();
    char byte;
    EXPECT_EQ(read(waiting.get(), &byte, 1), 0);
  }
  ~Holder() {
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
  }
  Holder(const Holder&) = delete;
  Holder& operator=(const Holder&) = delete;

  // Returns the signal that has ended the process, or 0 if it lives. The process stays to be
  // reaped.
  int ended_by() const {
    siginfo_t info = {};
    EXPECT_EQ(waitid(P_PID, static_cast<id_t>(pid_), &info, WEXITED | WNOHANG | WNOWAIT), 0);
    return info.si_pid == pid_ ? info.si_status : 0;
  }

 private:
  pid_t pid_;
};

}  // namespace sentrova::testing
