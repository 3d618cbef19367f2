#include <android-base/file.h>
#include <errno.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/descriptors.h"
#include "tests/support/private_mounts.h"
#include "tests/support/process_limits.h"
#include "toolkit/zuno_func.h"

namespace {

using sentrova::testing::count_descriptors;
using ::testing::ExitedWithCode;

// Lists the command's descriptors.
constexpr char kListDescriptors[] = "exec ls /proc/self/fd";

std::string read_all(FILE* stream) {
  std::string text;
  EXPECT_TRUE(stream != nullptr && android::base::ReadFdToString(fileno(stream), &text));
  return text;
}

class PipeStreams : public ::testing::Test {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    ASSERT_TRUE(sentrova::testing::provide_shell());
  }
};

TEST_F(PipeStreams, WriteInputAndWaitForItsUse) {
  const TemporaryFile file;
  FILE* stream = __popen(("cat >" + std::string(file.path) + "; kill -15 $$").c_str(), "w");
  ASSERT_NE(stream, nullptr);
  EXPECT_EQ(fputs("some input", stream), 1);
  EXPECT_EQ(__pclose(stream), 15);
  std::string content;
  EXPECT_TRUE(android::base::ReadFileToString(file.path, &content));
  EXPECT_EQ(content, "some input");
}

TEST_F(PipeStreams, TakeTheirOwnStreamsAndModesOnlyAndCloseInAnyOrder) {
  for (const char* mode : {"rw", "", "re", "R"}) {
    errno = 0;
    EXPECT_EQ(__popen("true", mode), nullptr) << mode;
    EXPECT_EQ(errno, EINVAL) << mode;
  }
  const std::unique_ptr<FILE, int (*)(FILE*)> foreign(tmpfile(), fclose);
  EXPECT_EQ(__pclose(foreign.get()), -1);  // with an empty list
  std::vector<FILE*> streams;
  for (int code = 0; code < 5; ++code) {
    streams.push_back(__popen(("exit " + std::to_string(code)).c_str(), "r"));
  }
  EXPECT_EQ(__pclose(foreign.get()), -1);
  EXPECT_EQ(fputs("still open", foreign.get()), 1);
  for (const size_t index : {2U, 4U, 0U, 1U, 3U}) {
    EXPECT_EQ(__pclose(streams[index]), static_cast<int>(index) << 8);
    EXPECT_EQ(__pclose(streams[index]), -1);
  }
  EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
}

TEST_F(PipeStreams, OpenedByTwoThreadsAtOnceReachNoOtherChild) {
  FILE* alone = __popen(kListDescriptors, "r");
  const std::string usual = read_all(alone);
  __pclose(alone);
  const auto descriptors = count_descriptors();
  const auto use = [&] {
    for (int round = 0; round < 150; ++round) {
      FILE* input = __popen("exit 5", "w");
      FILE* listing = __popen(kListDescriptors, "r");
      EXPECT_EQ(read_all(listing), usual);
      EXPECT_EQ(__pclose(input), 5 << 8);
      EXPECT_EQ(__pclose(listing), 0);
    }
  };
  std::thread other(use);
  use();
  other.join();
  EXPECT_EQ(count_descriptors(), descriptors);
}

// A pipe's ends become the lowest free descriptors, the command's own among them.
TEST_F(PipeStreams, WorkInAProcessWithoutStandardStreams) {
  const auto works_without = [](unsigned int last_closed) {
    close_range(last_closed == 1 ? 1 : 0, last_closed, 0);
    FILE* reader = __popen("echo text", "r");
    const bool reads = read_all(reader) == "text\n" && __pclose(reader) == 0;
    FILE* writer = __popen("read word; test \"$word\" = text", "w");
    return reads && writer != nullptr && fputs("text\n", writer) == 1 && __pclose(writer) == 0;
  };
  for (const unsigned int last_closed : {0U, 1U, 2U}) {
    EXPECT_EXIT(_exit(works_without(last_closed) ? 0 : 1), ExitedWithCode(0), "") << last_closed;
  }
}

TEST_F(PipeStreams, LeaveNothingBehindWhenTheyCannotBeOpened) {
  const auto fails_with = [](int error) {
    const auto descriptors = count_descriptors();
    errno = 0;
    const bool failed = __popen("true", "r") == nullptr;
    return failed && errno == error && count_descriptors() == descriptors ? 0 : 1;
  };
  using sentrova::testing::forbid_new_processes;
  EXPECT_EXIT(_exit(forbid_new_processes() ? fails_with(EAGAIN) : 2), ExitedWithCode(0), "");
  const sentrova::testing::DescriptorLimit too_few_for_a_pipe(1);
  EXPECT_EQ(fails_with(EMFILE), 0);
}

}  // namespace
