#include "cli/unlock_command.h"

#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <binder/IServiceManager.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pty.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/wait.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <string>
#include <vector>

#include "interface/isentrova_service.h"

namespace {

using android::sp;

// A device whose data is locked by a password.
class FakeService : public android::BnInterface<android::ISentrovaService> {
 public:
  int32_t getUserPassWordType(int /*userId*/) override { return 2; }
  int32_t verifyUserPassWord(int /*userId*/, std::string password) override {
    return check(password);
  }
  int32_t fdeDecryptUser(int /*userId*/) override { return -1; }
  int32_t fbeDecryptMetadata() override { return 0; }
  int32_t fbeDecryptUserDe(int /*userId*/) override { return 0; }
  int32_t fbeDecryptUserCe(int /*userId*/, std::string password, bool /*flag*/) override {
    return check(password);
  }

 private:
  static int32_t check(const std::string& password) { return password == "open sesame" ? 0 : -1; }
};

class FakeServiceManager : public android::IServiceManager {
 public:
  sp<android::IBinder> getService(const android::String16& name) const override {
    return checkService(name);
  }
  sp<android::IBinder> checkService(const android::String16& /*name*/) const override {
    return service_;
  }
  android::status_t addService(const android::String16& /*name*/,
                               const sp<android::IBinder>& /*service*/, bool /*allow_isolated*/,
                               int /*dump_flags*/) override {
    return android::PERMISSION_DENIED;
  }
  android::Vector<android::String16> listServices(int /*dump_flags*/) override { return {}; }

 private:
  android::IBinder* onAsBinder() override { return nullptr; }

  const sp<FakeService> service_ = new FakeService;
};

}  // namespace

// The program under test takes this one.
sp<android::IServiceManager> android::defaultServiceManager() {
  return new FakeServiceManager;
}

namespace {

constexpr char kPrompt[] = "Password: ";

// A person at a terminal at which `sentrova unlock` runs in a child.
class Person {
 public:
  // Else the terminal is not the one that controls the child.
  explicit Person(bool controls) {
    int terminal = -1;
    child_ = forkpty(&terminal, nullptr, nullptr, nullptr);
    if (child_ == 0) {
      if (!controls) {
        signal(SIGHUP, SIG_IGN);  // which giving it up brings
        ioctl(STDIN_FILENO, TIOCNOTTY);
      }
      const bool json = false;
      const int status =
          sentrova::unlock_data(0, sentrova::kMethodFileBased, sentrova::Output(json));
      fflush(stdout);
      _exit(status);
    }
    terminal_.reset(terminal);
  }

  // Typed before the prompt is there, a password would be dropped; an interrupt between the prompt
  // and the wait for keys would not end that wait.
  void answer(const std::string& keys) {
    const size_t before = screen_.size();
    while (screen_.find(kPrompt, before) == std::string::npos && look()) {
    }
    for (int time = 0; !waits() && time < 5000; ++time) {
      usleep(1000);
    }
    EXPECT_EQ(write(terminal_.get(), keys.data(), keys.size()), static_cast<ssize_t>(keys.size()));
  }

  // The child's wait status.
  int watch_end() {
    while (look()) {
    }
    int status = -1;
    kill(child_, SIGKILL);  // has no effect on one that ended
    EXPECT_EQ(waitpid(child_, &status, 0), child_);
    return status;
  }

  bool echo() const {
    termios settings = {};
    return tcgetattr(terminal_.get(), &settings) == 0 && (settings.c_lflag & ECHO) != 0;
  }

  const std::string& screen() const { return screen_; }

  int times_seen(const std::string& text) const {
    int count = 0;
    for (size_t at = screen_.find(text); at != std::string::npos; at = screen_.find(text, at + 1)) {
      ++count;
    }
    return count;
  }

 private:
  bool waits() const {
    std::string stat;
    android::base::ReadFileToString("/proc/" + std::to_string(child_) + "/stat", &stat);
    return stat.find(") S ") != std::string::npos;
  }

  // False at the end, and when nothing more comes.
  bool look() {
    constexpr int kPatienceMs = 5000;
    pollfd waiting = {terminal_.get(), POLLIN, 0};
    char text[256];
    const ssize_t count =
        poll(&waiting, 1, kPatienceMs) == 1 ? read(terminal_.get(), text, sizeof(text)) : -1;
    screen_.append(text, static_cast<size_t>(std::max<ssize_t>(count, 0)));
    return count > 0;
  }

  pid_t child_ = -1;
  android::base::unique_fd terminal_;
  std::string screen_;
};

const struct {
  bool controls;
  std::vector<std::string> typed;
  int wait_status;
  int wrong;  // how often the program says so
} kVisits[] = {
    {true, {"open sesame\n"}, W_EXITCODE(sentrova::kExitSuccess, 0), 0},
    {true, {"secret\n", "\n", "open sesame!\x7f\n"}, W_EXITCODE(sentrova::kExitSuccess, 0), 2},
    {true, {"secret\n", "\x04", "secret\n"}, W_EXITCODE(sentrova::kExitAnswerIsNo, 0), 3},
    {true, {"secret\n", "sec\x03"}, W_EXITCODE(0, SIGINT), 1},
    {false, {}, W_EXITCODE(sentrova::kExitUsage, 0), 0},
};

TEST(UnlockOnATerminal, HasThreeTriesWithoutEcho) {
  for (const auto& visit : kVisits) {
    Person person(visit.controls);
    for (const std::string& keys : visit.typed) {
      person.answer(keys);
    }
    const int status = person.watch_end();
    SCOPED_TRACE(person.screen());
    EXPECT_EQ(status, visit.wait_status);
    EXPECT_EQ(person.times_seen(kPrompt), static_cast<int>(visit.typed.size()));
    EXPECT_EQ(person.times_seen("password: wrong"), visit.wrong);
    EXPECT_EQ(person.times_seen("readable now: everything"), status == 0 ? 1 : 0);
    EXPECT_EQ(person.times_seen("sec") + person.times_seen("sesam"), 0);
    EXPECT_TRUE(person.echo());
  }
}

}  // namespace
