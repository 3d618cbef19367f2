#include "device/zunogatekeeper/provision.h"

#include <android-base/file.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <vector>

#include "device/zunogatekeeper/credential_store.h"

namespace sentrova {
namespace {

class Provision : public testing::Test {
 protected:
  // Runs the command with `input` on its standard input; keeps what it said.
  int run(std::vector<std::string> arguments, const std::string& input) {
    const TemporaryFile file;
    EXPECT_TRUE(android::base::WriteStringToFd(input, file.fd));
    EXPECT_EQ(0, lseek(file.fd, 0, SEEK_SET));
    arguments.insert(arguments.begin(), "provision_credential");
    std::vector<char*> argv;
    for (std::string& argument : arguments) {
      argv.push_back(argument.data());
    }
    argv.push_back(nullptr);
    testing::internal::CaptureStderr();
    testing::internal::CaptureStdout();
    const int status = provision(static_cast<int>(arguments.size()), argv.data(), file.fd);
    said_ = testing::internal::GetCapturedStdout() + testing::internal::GetCapturedStderr();
    return status;
  }

  bool has_password(int status, std::string_view password) {
    std::string error;
    const std::optional<Credential> stored = read_credential(store_, 0, error);
    EXPECT_TRUE(stored) << error;
    return stored && stored->status == status &&
           has_digest(password, stored->salt, stored->cost, stored->digest);
  }

  size_t file_count() const {
    const std::filesystem::directory_iterator files(folder_.path);
    return static_cast<size_t>(std::distance(begin(files), end(files)));
  }

  TemporaryDir folder_;
  const std::string store_ = folder_.path + std::string("/credentials.db");
  std::string said_;
};

TEST_F(Provision, ReplacesTheStoreByTheFirstLineOfInputAsItIs) {
  const std::pair<std::string, std::string> rows[] = {
      {"no end of line", "no end of line"},
      {" blanks \r\nnext line\n", " blanks \r"},
      {std::string(1024, 'x') + "\n", std::string(1024, 'x')}};
  const mode_t mask = umask(0);
  for (const auto& [input, password] : rows) {
    EXPECT_EQ(0, run({"--store", store_, "--status", "3", "--cost=4"}, input)) << said_;
    EXPECT_TRUE(has_password(3, password)) << input;
    EXPECT_EQ("", said_);
  }
  umask(mask);
  EXPECT_EQ(std::filesystem::perms(0600), std::filesystem::status(store_).permissions());
  EXPECT_EQ(1u, file_count());
  const std::optional<Credential> first = read_credential(store_, 0, said_);
  EXPECT_EQ(0, run({"--store", store_, "--status=3", "--cost=4"}, rows[2].first));
  EXPECT_NE(first->salt, read_credential(store_, 0, said_)->salt);
}

TEST_F(Provision, WrongUseIsExitStatusTwoAndLeavesTheStore) {
  ASSERT_EQ(0, run({"--store", store_, "--status=1", "--cost=4"}, "kept\n"));
  const std::pair<std::vector<std::string>, std::string> cases[] = {
      {{}, "1234\n"},
      {{"--status", "6"}, "1234\n"},
      {{"--status", "2x"}, "1234\n"},
      {{"--status", "2", "--cost", "17"}, "1234\n"},
      {{"--status", "2", "1234"}, "1234\n"},
      {{"--status", "2"}, ""},
      {{"--status", "2"}, "\nsecond line\n"},
      {{"--status", "2"}, std::string("12\0", 3) + "34\n"},
      {{"--status", "2"}, std::string(1025, 'x')}};
  for (auto [arguments, input] : cases) {
    arguments.insert(arguments.begin(), {"--store", store_});
    EXPECT_EQ(2, run(arguments, input)) << testing::PrintToString(arguments);
    EXPECT_NE("", said_);
    EXPECT_EQ(std::string::npos, said_.find("xxxx")) << said_;
  }
  EXPECT_TRUE(has_password(1, "kept"));
  EXPECT_EQ(1u, file_count());
}

TEST_F(Provision, StoreThatCannotBeMadeIsExitStatusOne) {
  const std::string nowhere = folder_.path + std::string("/absent/credentials.db");
  EXPECT_EQ(1, run({"--store", nowhere, "--status", "0"}, ""));
  EXPECT_NE(std::string::npos, said_.find(nowhere + ": No such file or directory")) << said_;
  ASSERT_EQ(0, mkdir(store_.c_str(), 0700));
  EXPECT_EQ(1, run({"--store", store_, "--status", "0"}, ""));
  EXPECT_EQ(1u, file_count()) << "the new file was left behind";
}

}  // namespace
}  // namespace sentrova
