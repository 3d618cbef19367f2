#include <errno.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <tuple>
#include <vector>

#include "common/export.h"
#include "tests/support/captured_stdout.h"
#include "tests/support/private_mounts.h"
#include "tests/support/process_limits.h"
#include "tests/support/signals.h"
#include "tests/support/sleep_script.h"
#include "toolkit/zuno_func.h"

namespace {

using sentrova::testing::CapturedStdout;
using sentrova::testing::RepeatedInterruption;
using sentrova::testing::ScopedSignalAction;
using sentrova::testing::SleepScript;
using std::chrono::seconds;
using std::chrono::steady_clock;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

// While it is not null, the signals that the code under test sends are noted there and go nowhere.
std::vector<std::pair<pid_t, int>>* swallowed_kills = nullptr;

constexpr int kUntouched = 12345;
constexpr char kTooLong[] = "[ZunoFunc]I: tool took too long, killing process\n";
constexpr char kKilled[] = "[ZunoFunc]I: Child process killed successfully\n";
constexpr char kZombie[] =
    "[ZunoFunc]I: Child process took too long to kill, may be a zombie process\n";
constexpr char kNoChild[] = "[ZunoFunc]E: tool no child process exist\n";

// Waits until the child has ended and leaves it to be reaped.
void await_end(pid_t pid) {
  siginfo_t info;
  EXPECT_EQ(waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOWAIT), 0);
}

// What a wait with a time-out came to: its result, the sleeps, the status (kUntouched if it was not
// set) and the messages.
using Waited = std::tuple<int, size_t, int, std::string>;

Waited wait(
    pid_t pid, int timeout_seconds, const std::function<void(size_t)>& on_sleep = [](size_t) {}) {
  const SleepScript sleeps(on_sleep);
  CapturedStdout output;
  int status = kUntouched;
  const int result = ZunoFunc::Wait_For_Child_Timeout(pid, &status, "tool", timeout_seconds);
  EXPECT_THAT(sleeps.microseconds(), Each(1'000'000));
  return {result, sleeps.microseconds().size(), status, output.take()};
}

class Commands : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    ASSERT_TRUE(sentrova::testing::provide_shell());
  }

  static pid_t start(const std::string& command) {
    CapturedStdout output;
    return ZunoFunc::Exec_Cmd(std::vector<std::string>{"/system/bin/sh", "-c", command});
  }
};

TEST_F(Commands, ReportTheirEnd) {
  struct Row {
    const char* command;
    int result;
    const char* message;
  };
  for (const Row& row :
       {Row{"echo $0", 0, "sh\n[ZunoFunc]E: echo $0 process ended with RC=0\n"},
        Row{"exit 3", -1, "[ZunoFunc]E: pid_error=exit 3 process ended with ERROR: 3\n"},
        Row{"kill -9 $$", -1,
            "[ZunoFunc]E: pid_signal=kill -9 $$ process ended with signal: [9]\n"}}) {
    CapturedStdout output;
    EXPECT_EQ(ZunoFunc::Exec_Cmd(row.command), row.result);
    EXPECT_EQ(output.take(), row.message);
  }
  const sentrova::testing::ScopedTmpfs no_shell("/system");
  CapturedStdout output;
  std::string result;
  EXPECT_EQ(ZunoFunc::Exec_Cmd("true"), -1);
  EXPECT_EQ(ZunoFunc::Exec_Cmd("true", result), 127 << 8);
  EXPECT_EQ(output.take(), "[ZunoFunc]E: pid_error=true process ended with ERROR: 127\n");
}

TEST_F(Commands, HaveTheirOutputAppendedPieceByPiece) {
  const std::string long_line(300, 'x');
  struct Row {
    std::string command, output;
    int status;
  };
  const Row rows[] = {
      {"printf 'no end'; exit 1", "no end", 256},
      {"echo before; kill -15 $$", "before\n", 15},
      {"echo " + long_line, long_line + "\n", 0},
      {R"(printf 'a\0b\nc\n\0\nd')", "ac\nd", 0},  // what follows a NUL in a line is dropped
      {R"(printf '%0127d\0b' 0)", std::string(127, '0'), 0},  // a piece is full before the NUL
      {"exec >&-; sleep 0.1; exit 4", "", 4 << 8},
      {"printf abc; sleep 0.2; echo def; exec >&-; sleep 0.1; exit 2", "abcdef\n", 2 << 8},
  };
  const RepeatedInterruption interruption;
  for (const Row& row : rows) {
    std::string result = "kept ";
    EXPECT_EQ(ZunoFunc::Exec_Cmd(row.command, result), row.status) << row.command;
    EXPECT_EQ(result, "kept " + row.output) << row.command;
  }
}

TEST_F(Commands, FailWhereNoProcessCanBeMade) {
  const auto fail = [] {
    if (!sentrova::testing::forbid_new_processes()) {
      return 2;
    }
    CapturedStdout output;
    const bool failed = ZunoFunc::Exec_Cmd("true") == -1 &&
                        ZunoFunc::Exec_Cmd(std::vector<std::string>{"/bin/true"}) == -1;
    return failed && output.take() ==
                         "[ZunoFunc]E: Exec_Cmd(): vfork failed: 11\n"
                         "[ZunoFunc]E: Exec_Cmd(): fork failed: 11!\n"
               ? 0
               : 1;
  };
  EXPECT_EXIT(_exit(fail()), ::testing::ExitedWithCode(0), "");
}

TEST(ArgumentList, ReachesTheProgramAsItIs) {
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::Exec_Cmd(std::vector<std::string>{}), -1);
  const pid_t pid = ZunoFunc::Exec_Cmd(std::vector<std::string>{
      "/bin/sh", "-c", R"(printf '<%s>' "$0" "$@")", "zero", "a b", "", "$HOME;'\"", "new\nline"});
  int status = kUntouched;
  EXPECT_EQ(waitpid(pid, &status, 0), pid);
  EXPECT_EQ(status, 0);
  const std::string text = output.take();
  EXPECT_THAT(text, HasSubstr("<zero><a b><><$HOME;'\"><new\nline>"));
  EXPECT_THAT(text, HasSubstr("[ZunoFunc]E: Exec_Cmd(): pid: " + std::to_string(pid) + "!\n"));

  for (const char* program : {"/absent", "sh", ""}) {  // PATH is not searched
    CapturedStdout ignored;
    const pid_t failed = ZunoFunc::Exec_Cmd(std::vector<std::string>{program});
    EXPECT_EQ(waitpid(failed, &status, 0), failed);
    EXPECT_EQ(status, 1 << 8) << program;
  }
}

TEST_F(Commands, AreLookedAfterEverySecondUntilTheTimeOut) {
  for (const char* command : {"exit 0", "exit 3"}) {
    const pid_t pid = start(command);
    await_end(pid);
    EXPECT_EQ(wait(pid, 0), Waited(0, 0, (command[5] - '0') << 8, ""));
  }
  for (const int timeout_seconds : {3, 10, -1}) {
    const pid_t pid = start("exec sleep 10");
    const auto end_in_the_third_second = [&](size_t second) {
      if (second == 3) {
        kill(pid, SIGTERM);
        await_end(pid);
      }
    };
    EXPECT_EQ(
        wait(pid, timeout_seconds, end_in_the_third_second),
        Waited(-1, 3, SIGTERM, "[ZunoFunc]E: pid_signal=tool process ended with signal: [15]\n"));
  }
}

TEST_F(Commands, AreKilledAfterTheTimeOut) {
  for (const size_t timeout_seconds : {size_t{0}, size_t{2}}) {
    const pid_t pid = start("exec sleep 10");
    const auto last_two_seconds = [&](size_t second) {
      if (second == timeout_seconds + 1) {
        await_end(pid);
      }
    };
    EXPECT_EQ(wait(pid, static_cast<int>(timeout_seconds), last_two_seconds),
              Waited(-1, timeout_seconds + 1, SIGKILL, kTooLong + std::string(kKilled)));
    EXPECT_EQ(waitpid(pid, nullptr, WNOHANG), -1);
  }
  const pid_t reaped = start("exec sleep 10");  // by the host
  EXPECT_EQ(wait(reaped, 0, [&](size_t) { EXPECT_EQ(waitpid(reaped, nullptr, 0), reaped); }),
            Waited(-1, 1, kUntouched, kTooLong + std::string(kKilled)));
}

TEST_F(Commands, AreKilledInTimeWhileSignalsInterruptTheWait) {
  const pid_t pid = start("exec sleep 10");
  const RepeatedInterruption interruption;
  CapturedStdout output;
  const auto begin = steady_clock::now();
  int status = kUntouched;
  EXPECT_EQ(ZunoFunc::Wait_For_Child(pid, &status, "tool"), -1);
  EXPECT_EQ(output.take(), "[ZunoFunc]E: tool Unexpected error " + std::to_string(EINTR) + "\n");
  EXPECT_EQ(status, kUntouched);
  EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(pid, &status, "tool", 1), -1);
  const auto taken = steady_clock::now() - begin;
  EXPECT_GE(taken, seconds(2));  // one of patience and one until the first look after the kill
  EXPECT_LT(taken, seconds(4));
  EXPECT_EQ(status, SIGKILL);
}

TEST_F(Commands, ThatSurviveTheKillAreGivenUpAfterFiveSeconds) {
  const auto give_up = [] {
    setpgid(0, 0);
    const pid_t pid = start("exec sleep 10");
    std::vector<std::pair<pid_t, int>> kills;
    swallowed_kills = &kills;
    const std::string output = kTooLong + std::string(kZombie);
    EXPECT_EQ(wait(pid, 1), Waited(-1, 1 + 5, kUntouched, output));
    // The id of a failed fork stands for any child in the wait; the kernel would kill everybody.
    EXPECT_EQ(wait(-1, 0), Waited(-1, 5, kUntouched, output));
    EXPECT_EQ(wait(0, 0), Waited(-1, 5, kUntouched, output));  // and its caller too
    EXPECT_THAT(kills, ElementsAre(std::pair(pid, SIGKILL)));
    swallowed_kills = nullptr;
    kill(pid, SIGKILL);
  };
  EXPECT_EXIT((give_up(), _exit(HasFailure())), ::testing::ExitedWithCode(0), "");
}

TEST_F(Commands, ThatSomebodyElseReapsCountAsASuccess) {
  EXPECT_EQ(wait(getppid(), 5), Waited(0, 0, kUntouched, kNoChild));
  EXPECT_EQ(wait(-1, 5), Waited(0, 0, kUntouched, kNoChild));
  int status = kUntouched;
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::Wait_For_Child(getppid(), &status, "tool"), 0);
  EXPECT_EQ(status, kUntouched);
  const ScopedSignalAction ignored(SIGCHLD, SIG_IGN);
  EXPECT_EQ(ZunoFunc::Exec_Cmd("exit 3"), 0);
  EXPECT_EQ(output.take(), kNoChild + std::string("[ZunoFunc]E: exit 3 no child process exist\n"));
  std::string result;
  EXPECT_EQ(ZunoFunc::Exec_Cmd("echo text; exit 3", result), -1);
  EXPECT_EQ(result, "text\n");
  const pid_t pid = start("exec sleep 10");
  const auto end = [&](size_t) {
    kill(pid, SIGKILL);
    EXPECT_EQ(waitpid(pid, nullptr, 0), -1);
  };
  EXPECT_EQ(wait(pid, 10, end), Waited(0, 1, kUntouched, kNoChild));
}

}  // namespace

// In place of the C library's, for the code under test.
extern "C" SENTROVA_API int kill(pid_t pid, int signal) noexcept {
  if (swallowed_kills != nullptr) {
    swallowed_kills->emplace_back(pid, signal);
    return 0;
  }
  return static_cast<int>(syscall(SYS_kill, pid, signal));
}
