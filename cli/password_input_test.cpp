#include "cli/password_input.h"

#include <android-base/unique_fd.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <string>
#include <utility>

namespace {

using android::base::unique_fd;
using sentrova::PasswordInput;

unique_fd file_with(const std::string& content) {
  unique_fd fd(memfd_create("input", MFD_CLOEXEC));
  EXPECT_EQ(write(fd.get(), content.data(), content.size()), static_cast<ssize_t>(content.size()));
  EXPECT_EQ(lseek(fd.get(), 0, SEEK_SET), 0);
  return fd;
}

TEST(PasswordLine, IsTakenWithoutItsEnd) {
  const std::string longest(sentrova::kMaxPasswordBytes, 'x');
  const std::pair<std::string, std::string> table[] = {{"secret\n", "secret"},
                                                       {" two words \r\n", " two words \r"},
                                                       {"\n", ""},
                                                       {"first\nrest", "first"},
                                                       {longest + "\n", longest}};
  for (const auto& [input, password] : table) {
    const unique_fd fd = file_with(input);
    const PasswordInput read = sentrova::read_password_line(fd.get());
    EXPECT_EQ(read.error, "");
    EXPECT_EQ(read.password, password);
    if (input == "first\nrest") {
      EXPECT_EQ(lseek(fd.get(), 0, SEEK_CUR), 6) << "the rest stays";
    }
  }
}

TEST(PasswordLine, UnusableInputIsAnError) {
  const std::pair<std::string, std::string> table[] = {
      {"", "no password"},
      {std::string("a\0b\n", 4), "NUL"},
      {"\xff\xfe\n", "UTF-8"},
      {"cut \xf0\x9f\n", "UTF-8"},
      {std::string(sentrova::kMaxPasswordBytes + 1, 'x'), "longer than"}};
  for (const auto& [input, error] : table) {
    const PasswordInput read = sentrova::read_password_line(file_with(input).get());
    EXPECT_NE(read.error.find(error), std::string::npos) << read.error;
    EXPECT_EQ(read.password, "");
  }
  EXPECT_NE(sentrova::read_password_line(-1).error, "");
}

}  // namespace
