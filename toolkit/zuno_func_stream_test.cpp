#include <android-base/file.h>
#include <errno.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <iterator>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/private_mounts.h"
#include "tests/support/process_limits.h"
#include "toolkit/zuno_func.h"

namespace {

using sentrova::testing::forbid_new_descriptors;
using sentrova::testing::forbid_new_processes;
using ::testing::ExitedWithCode;

// Lists the shell's descriptors, one a line.
constexpr char kListDescriptors[] = "ls -l /proc/$$/fd 2>/dev/null";

std::string read_all(FILE* stream) {
  std::string text;
  for (int byte; (byte = getc(stream)) != EOF;) {
    text.push_back(static_cast<char>(byte));
  }
  return text;
}

// Returns how many pipe ends a command that `stream` reads from holds; the stream must be of
// kListDescriptors.
int count_pipes(FILE* stream) {
  const std::string listing = read_all(stream);
  int pipes = 0;
  for (size_t at = 0; (at = listing.find("pipe:", at)) != listing.npos; ++at) {
    ++pipes;
  }
  return pipes;
}

size_t count_descriptors() {
  const std::filesystem::directory_iterator entries("/proc/self/fd");
  return static_cast<size_t>(std::distance(begin(entries), end(entries)));
}

void close_all(const std::vector<int>& descriptors) {
  for (const int fd : descriptors) {
    close(fd);
  }
}

class PipeStreams : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    ASSERT_TRUE(sentrova::testing::provide_shell());
  }

  // The pipe ends of a command that is alone: its own, and those that the test runner gave to all.
  static int usual_pipes() {
    FILE* stream = __popen(kListDescriptors, "r");
    const int pipes = count_pipes(stream);
    __pclose(stream);
    return pipes;
  }
};

TEST_F(PipeStreams, WriteInputAndWaitForItsUse) {
  const TemporaryFile file;
  FILE* stream = __popen(("cat >" + std::string(file.path) + "; kill -15 $$").c_str(), "w");
  ASSERT_NE(stream, nullptr);
  EXPECT_EQ(fputs("some input", stream), 1);
  EXPECT_EQ(__pclose(stream), 15);
  std::string content;
  ASSERT_TRUE(android::base::ReadFileToString(file.path, &content));
  EXPECT_EQ(content, "some input");
}

TEST(PipeStream, ModesOtherThanReadAndWriteAreInvalid) {
  for (const char* mode : {"rw", "x", "", "r+", "re", "wr", "R"}) {
    errno = 0;
    EXPECT_EQ(__popen("true", mode), nullptr) << mode;
    EXPECT_EQ(errno, EINVAL) << mode;
  }
}

TEST_F(PipeStreams, ForeignAndClosedStreamsAreRefused) {
  const std::unique_ptr<FILE, int (*)(FILE*)> foreign(tmpfile(), fclose);
  EXPECT_EQ(__pclose(foreign.get()), -1);  // with an empty list
  FILE* stream = __popen("true", "r");
  EXPECT_EQ(__pclose(foreign.get()), -1);
  EXPECT_EQ(fputs("still open", foreign.get()), 1);
  EXPECT_EQ(__pclose(stream), 0);
  EXPECT_EQ(__pclose(stream), -1);
}

TEST_F(PipeStreams, MayBeClosedInAnyOrder) {
  std::vector<FILE*> streams;
  for (int code = 0; code < 5; ++code) {
    streams.push_back(__popen(("exit " + std::to_string(code)).c_str(), "r"));
    ASSERT_NE(streams.back(), nullptr);
  }
  for (const size_t index : {2U, 4U, 0U, 1U, 3U}) {
    EXPECT_EQ(__pclose(streams[index]), static_cast<int>(index) << 8);
  }
  EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
}

TEST_F(PipeStreams, OpenedByTwoThreadsAtOnceReachNoOtherChild) {
  constexpr int kRounds = 150;
  const int usual = usual_pipes();
  const size_t descriptors = count_descriptors();
  int leaks[2] = {};
  int failures[2] = {};
  const auto use = [&](size_t thread) {
    for (int round = 0; round < kRounds; ++round) {
      FILE* input = __popen("exit 5", "w");
      FILE* listing = __popen(kListDescriptors, "r");
      leaks[thread] += count_pipes(listing) != usual;
      failures[thread] += __pclose(input) != 5 << 8;
      failures[thread] += __pclose(listing) != 0;
    }
  };
  std::thread other(use, 1);
  use(0);
  other.join();
  EXPECT_EQ(leaks[0] + leaks[1], 0);
  EXPECT_EQ(failures[0] + failures[1], 0);
  EXPECT_EQ(count_descriptors(), descriptors);
}

// A pipe's ends become the lowest free descriptors, the command's own among them.
TEST_F(PipeStreams, WorkInAProcessWithoutStandardStreams) {
  const auto read_without = [](const std::vector<int>& closed) {
    close_all(closed);
    FILE* stream = __popen("echo text", "r");
    return stream != nullptr && read_all(stream) == "text\n" && __pclose(stream) == 0 ? 0 : 1;
  };
  const auto write_without = [](const std::vector<int>& closed) {
    close_all(closed);
    FILE* stream = __popen("read word; test \"$word\" = text", "w");
    return stream != nullptr && fputs("text\n", stream) == 1 && __pclose(stream) == 0 ? 0 : 1;
  };
  for (const std::vector<int>& closed :
       std::vector<std::vector<int>>{{0}, {1}, {0, 1}, {0, 1, 2}}) {
    EXPECT_EXIT(_exit(read_without(closed)), ExitedWithCode(0), "") << closed.size();
    EXPECT_EXIT(_exit(write_without(closed)), ExitedWithCode(0), "") << closed.size();
  }
}

TEST_F(PipeStreams, LeaveNothingBehindWhenTheyCannotBeOpened) {
  const auto fails_with = [](int error) {
    const size_t descriptors = count_descriptors();
    errno = 0;
    const bool failed = __popen("true", "r") == nullptr;
    return failed && errno == error && count_descriptors() == descriptors ? 0 : 1;
  };
  EXPECT_EXIT(_exit(forbid_new_processes() ? fails_with(EAGAIN) : 2), ExitedWithCode(0), "");
  EXPECT_EXIT(_exit(forbid_new_descriptors() ? fails_with(EMFILE) : 2), ExitedWithCode(0), "");
}

}  // namespace
