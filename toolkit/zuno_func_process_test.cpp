#include <errno.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
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
using sentrova::testing::forbid_new_processes;
using sentrova::testing::RepeatedInterruption;
using sentrova::testing::ScopedSignalAction;
using sentrova::testing::ScopedTmpfs;
using sentrova::testing::SleepScript;
using std::chrono::seconds;
using std::chrono::steady_clock;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr int64_t kSecond = 1'000'000;
constexpr int kUntouched = 12345;

// While one is alive, signals that the code under test sends are noted and go nowhere.
class SwallowedKills {
 public:
  SwallowedKills() { current = this; }
  ~SwallowedKills() { current = nullptr; }
  SwallowedKills(const SwallowedKills&) = delete;
  SwallowedKills& operator=(const SwallowedKills&) = delete;

  static SwallowedKills* current;
  std::vector<std::pair<pid_t, int>> kills;
};
SwallowedKills* SwallowedKills::current = nullptr;

// Waits until the child has ended and leaves it to be reaped.
void await_end(pid_t pid) {
  siginfo_t info;
  EXPECT_EQ(waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOWAIT), 0);
}

bool is_child(pid_t pid) {
  siginfo_t info;
  return waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOHANG | WNOWAIT) == 0;
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

TEST_F(Commands, RunThroughTheShellReportTheirEnd) {
  struct Case {
    const char* command;
    int result;
    const char* message;
  };
  const Case cases[] = {
      {"exit 0", 0, "[ZunoFunc]E: exit 0 process ended with RC=0\n"},
      {"exit 3", -1, "[ZunoFunc]E: pid_error=exit 3 process ended with ERROR: 3\n"},
      {"kill -9 $$", -1, "[ZunoFunc]E: pid_signal=kill -9 $$ process ended with signal: [9]\n"},
      {"echo $0", 0, "sh\n[ZunoFunc]E: echo $0 process ended with RC=0\n"},
  };
  for (const Case& c : cases) {
    CapturedStdout output;
    const int result = ZunoFunc::Exec_Cmd(c.command);
    EXPECT_EQ(output.take(), c.message);
    EXPECT_EQ(result, c.result) << c.command;
  }
}

TEST_F(Commands, WithoutAShellEndWith127) {
  const ScopedTmpfs no_shell("/system");
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::Exec_Cmd("true"), -1);
  std::string result;
  EXPECT_EQ(ZunoFunc::Exec_Cmd("true", result), 127 << 8);
  EXPECT_EQ(output.take(), "[ZunoFunc]E: pid_error=true process ended with ERROR: 127\n");
  EXPECT_EQ(result, "");
}

TEST_F(Commands, OutputIsAppendedPieceByPiece) {
  const std::string long_line(300, 'x');
  struct Case {
    std::string command;
    std::string output;
    int status;
  };
  const Case cases[] = {
      {"echo $0", "sh\n", 0},
      {"printf 'no end'; exit 1", "no end", 256},
      {"echo before; kill -15 $$", "before\n", 15},
      {"echo " + long_line, long_line + "\n", 0},
      {R"(printf 'a\0b\nc\n')", "ac\n", 0},  // what follows a NUL in a line is dropped
      {R"(printf '\0\n\0\nc')", "c", 0},
      {"exec >&-; sleep 0.1; exit 4", "", 4 << 8},
  };
  for (const Case& c : cases) {
    std::string result = "kept ";
    EXPECT_EQ(ZunoFunc::Exec_Cmd(c.command, result), c.status) << c.command;
    EXPECT_EQ(result, "kept " + c.output) << c.command;
  }
}

TEST_F(Commands, OutputSurvivesInterruptedReads) {
  const RepeatedInterruption interruption;
  std::string result;
  EXPECT_EQ(
      ZunoFunc::Exec_Cmd("printf abc; sleep 0.2; echo def; exec >&-; sleep 0.3; exit 2", result),
      2 << 8);
  EXPECT_EQ(result, "abcdef\n");
}

TEST_F(Commands, FailWhereNoProcessCanBeMade) {
  const auto fail = [] {
    if (!forbid_new_processes()) {
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

TEST(ArgumentList, EmptyStartsNothing) {
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::Exec_Cmd(std::vector<std::string>{}), -1);
  EXPECT_EQ(output.take(), "");
  EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
}

TEST(ArgumentList, ReachesTheProgramAsItIs) {
  CapturedStdout output;
  const pid_t pid = ZunoFunc::Exec_Cmd(std::vector<std::string>{
      "/bin/sh", "-c", R"(printf '<%s>' "$0" "$@")", "zero", "a b", "", "$HOME;'\"", "new\nline"});
  ASSERT_GT(pid, 0);
  int status = 0;
  ASSERT_EQ(waitpid(pid, &status, 0), pid);
  EXPECT_EQ(status, 0);
  const std::string text = output.take();
  EXPECT_THAT(text, ::testing::HasSubstr("<zero><a b><><$HOME;'\"><new\nline>"));
  EXPECT_THAT(text,
              ::testing::HasSubstr("[ZunoFunc]E: Exec_Cmd(): pid: " + std::to_string(pid) + "!\n"));
}

TEST(ArgumentList, AProgramThatCannotBeExecutedEndsWith1) {
  for (const char* program : {"/absent", "sh", ""}) {  // PATH is not searched
    CapturedStdout output;
    const pid_t pid = ZunoFunc::Exec_Cmd(std::vector<std::string>{program});
    int status = 0;
    ASSERT_EQ(waitpid(pid, &status, 0), pid);
    EXPECT_EQ(status, 1 << 8) << program;
  }
}

TEST_F(Commands, AnExitCodeIsNoFailureForTheWaitWithATimeOut) {
  for (const char* command : {"exit 0", "exit 3"}) {
    const pid_t pid = start(command);
    await_end(pid);
    const SleepScript sleeps;
    CapturedStdout output;
    int status = kUntouched;
    EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(pid, &status, "label", 0), 0) << command;
    EXPECT_EQ(output.take(), "");
    EXPECT_EQ(WEXITSTATUS(status), command[5] - '0');
    EXPECT_THAT(sleeps.microseconds(), IsEmpty());
    EXPECT_FALSE(is_child(pid));
  }
}

TEST_F(Commands, AreLookedAfterEverySecondUntilTheTimeOut) {
  for (const int timeout_seconds : {3, 10, -1}) {
    const pid_t pid = start("exec sleep 10");
    const SleepScript sleeps([&](size_t count) {
      if (count == 3) {
        kill(pid, SIGTERM);
        await_end(pid);
      }
    });
    CapturedStdout output;
    int status = 0;
    EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(pid, &status, "tool", timeout_seconds), -1);
    EXPECT_EQ(output.take(), "[ZunoFunc]E: pid_signal=tool process ended with signal: [15]\n");
    EXPECT_THAT(sleeps.microseconds(), ElementsAre(kSecond, kSecond, kSecond));
    EXPECT_FALSE(is_child(pid));
  }
}

TEST_F(Commands, ThatIgnoreEverythingAreKilledAfterTheTimeOutAndReaped) {
  for (const size_t timeout_seconds : {size_t{0}, size_t{2}}) {
    // Programs keep the signals ignored that their parent ignored.
    const ScopedSignalAction no_term(SIGTERM, SIG_IGN);
    const ScopedSignalAction no_interrupt(SIGINT, SIG_IGN);
    const ScopedSignalAction no_hang_up(SIGHUP, SIG_IGN);
    const pid_t pid = start("exec sleep 10");
    const SleepScript sleeps([&](size_t count) {
      if (count == timeout_seconds + 2) {  // in the second second after the kill
        await_end(pid);
      }
    });
    CapturedStdout output;
    int status = 0;
    EXPECT_EQ(
        ZunoFunc::Wait_For_Child_Timeout(pid, &status, "tool", static_cast<int>(timeout_seconds)),
        -1);
    EXPECT_EQ(output.take(),
              "[ZunoFunc]I: tool took too long, killing process\n"
              "[ZunoFunc]I: Child process killed successfully\n");
    EXPECT_GE(sleeps.microseconds().size(), timeout_seconds + 1);
    EXPECT_LE(sleeps.microseconds().size(), timeout_seconds + 2);
    EXPECT_EQ(WTERMSIG(status), SIGKILL);
    EXPECT_FALSE(is_child(pid));
  }
}

TEST_F(Commands, ThatIgnoreEverythingAreKilledInTimeWhileSignalsInterruptTheWait) {
  const pid_t pid = start("trap '' TERM INT HUP QUIT; while :; do sleep 0.1; done");
  ASSERT_GT(pid, 0);
  const RepeatedInterruption interruption;
  CapturedStdout output;
  const auto begin = steady_clock::now();
  int status = 0;
  EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(pid, &status, "stubborn", 2), -1);
  const auto taken = steady_clock::now() - begin;
  EXPECT_GE(taken, seconds(3));  // two of patience and one until the first look after the kill
  EXPECT_LT(taken, seconds(5));
  EXPECT_EQ(WTERMSIG(status), SIGKILL);
  EXPECT_FALSE(is_child(pid));
}

TEST_F(Commands, ThatSurviveTheKillAreGivenUpAfterFiveSeconds) {
  const pid_t pid = start("exec sleep 10");
  {
    const SwallowedKills swallowed;
    const SleepScript sleeps;
    CapturedStdout output;
    int status = 0;
    EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(pid, &status, "tool", 1), -1);
    EXPECT_EQ(output.take(),
              "[ZunoFunc]I: tool took too long, killing process\n"
              "[ZunoFunc]I: Child process took too long to kill, may be a zombie process\n");
    EXPECT_THAT(sleeps.microseconds(), SizeIs(1 + 5));
    EXPECT_THAT(swallowed.kills, ElementsAre(std::pair(pid, SIGKILL)));

    // The id of a failed fork stands for any child in the wait; the kernel would kill everybody.
    CapturedStdout second_output;
    EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(-1, &status, "tool", 0), -1);
    EXPECT_THAT(swallowed.kills, SizeIs(1));
  }
  kill(pid, SIGKILL);
  EXPECT_EQ(waitpid(pid, nullptr, 0), pid);
}

TEST_F(Commands, OfTheOwnGroupAreNotKilledTogetherWithTheirCaller) {
  const auto wait_for_group = [] {
    if (setpgid(0, 0) != 0) {
      return 2;
    }
    const pid_t pid = start("exec sleep 10");
    CapturedStdout output;
    const SleepScript sleeps;
    int status = 0;
    const bool gave_up = ZunoFunc::Wait_For_Child_Timeout(0, &status, "tool", 0) == -1;
    const bool child_is_alive = waitpid(pid, nullptr, WNOHANG) == 0;
    kill(pid, SIGKILL);
    return gave_up && child_is_alive ? 0 : 1;
  };
  EXPECT_EXIT(_exit(wait_for_group()), ::testing::ExitedWithCode(0), "");
}

TEST(WaitForChild, TakesAMissingChildForASuccess) {
  const pid_t parent = getppid();
  const SleepScript sleeps;
  CapturedStdout output;
  int status = kUntouched;
  EXPECT_EQ(ZunoFunc::Wait_For_Child(parent, &status, "first"), 0);
  EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(parent, &status, "second", 5), 0);
  EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(-1, &status, "third", 5), 0);
  EXPECT_EQ(output.take(),
            "[ZunoFunc]E: first no child process exist\n"
            "[ZunoFunc]E: second no child process exist\n"
            "[ZunoFunc]E: third no child process exist\n");
  EXPECT_EQ(status, kUntouched);
  EXPECT_THAT(sleeps.microseconds(), IsEmpty());
}

TEST_F(Commands, WhoseEndTheHostIgnoresCountAsReaped) {
  const ScopedSignalAction ignored(SIGCHLD, SIG_IGN);
  {
    CapturedStdout output;
    EXPECT_EQ(ZunoFunc::Exec_Cmd("exit 3"), 0);
    EXPECT_EQ(output.take(), "[ZunoFunc]E: exit 3 no child process exist\n");
  }
  std::string result;
  EXPECT_EQ(ZunoFunc::Exec_Cmd("echo text; exit 3", result), -1);
  EXPECT_EQ(result, "text\n");

  const pid_t pid = start("exec sleep 10");
  const SleepScript sleeps([&](size_t) {
    kill(pid, SIGKILL);
    EXPECT_EQ(waitpid(pid, nullptr, 0), -1);
  });
  CapturedStdout output;
  int status = kUntouched;
  EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(pid, &status, "tool", 10), 0);
  EXPECT_EQ(output.take(), "[ZunoFunc]E: tool no child process exist\n");
  EXPECT_THAT(sleeps.microseconds(), SizeIs(1));
}

TEST_F(Commands, WhoseEndTheHostReapsDuringTheKillCountAsKilled) {
  const pid_t pid = start("exec sleep 10");
  const SleepScript sleeps([&](size_t) { EXPECT_EQ(waitpid(pid, nullptr, 0), pid); });
  CapturedStdout output;
  int status = 0;
  EXPECT_EQ(ZunoFunc::Wait_For_Child_Timeout(pid, &status, "tool", 0), -1);
  EXPECT_EQ(output.take(),
            "[ZunoFunc]I: tool took too long, killing process\n"
            "[ZunoFunc]I: Child process killed successfully\n");
  EXPECT_THAT(sleeps.microseconds(), SizeIs(1));
}

TEST_F(Commands, AWaitThatASignalInterruptsIsAnUnexpectedError) {
  const pid_t pid = start("exec sleep 10");
  {
    const RepeatedInterruption interruption;
    CapturedStdout output;
    int status = kUntouched;
    EXPECT_EQ(ZunoFunc::Wait_For_Child(pid, &status, "tool"), -1);
    EXPECT_EQ(output.take(), "[ZunoFunc]E: tool Unexpected error " + std::to_string(EINTR) + "\n");
    EXPECT_EQ(status, kUntouched);
  }
  kill(pid, SIGKILL);
  EXPECT_EQ(waitpid(pid, nullptr, 0), pid);
}

}  // namespace

// In place of the C library's, for the code under test.
extern "C" SENTROVA_API int kill(pid_t pid, int signal) noexcept {
  if (SwallowedKills::current != nullptr) {
    SwallowedKills::current->kills.emplace_back(pid, signal);
    return 0;
  }
  return static_cast<int>(syscall(SYS_kill, pid, signal));
}
