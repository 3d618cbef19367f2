#include "cli/password_input.h"

#include <bsd/readpassphrase.h>
#include <iconv.h>
#include <string.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <memory>
#include <utility>

#include "common/wipe.h"

namespace sentrova {
namespace {

PasswordInput failure(std::string error) {
  return {.password = "", .error = std::move(error)};
}

// Converts the text and throws the result away, piece by piece; the C library does the checking.
bool is_utf8(std::string& text) {
  const std::unique_ptr<void, int (*)(iconv_t)> converter(iconv_open("UCS-4LE", "UTF-8"),
                                                          iconv_close);
  char* from = text.data();
  size_t left = text.size();
  std::array<char, 1024> discarded;
  while (left > 0) {
    char* to = discarded.data();
    size_t room = discarded.size();
    const size_t converted = iconv(converter.get(), &from, &left, &to, &room);
    const bool invalid = converted == static_cast<size_t>(-1) && errno != E2BIG;
    explicit_bzero(discarded.data(), discarded.size());
    if (invalid) {
      return false;
    }
  }
  return true;
}

PasswordInput checked(std::string& password) {
  std::string error;
  if (password.find('\0') != std::string::npos) {
    error = "the password holds a NUL character";
  } else if (!is_utf8(password)) {
    error = "the password is not UTF-8 text";
  }
  if (!error.empty()) {
    return failure(std::move(error));
  }
  return {.password = std::move(password), .error = ""};
}

// Told to read standard input, readpassphrase would neither show the prompt nor switch the echo
// off; so would it without a controlling terminal, if it need not have one.
PasswordInput ask_on_terminal(const char* prompt) {
  std::array<char, 4096> line;
  if (readpassphrase(prompt, line.data(), line.size(), RPP_ECHO_OFF | RPP_REQUIRE_TTY) == nullptr) {
    const int error = errno;
    explicit_bzero(line.data(), line.size());
    return failure(error == ENOTTY
                       ? "no controlling terminal to ask on; give the password through a pipe"
                       : std::string("cannot read the password: ") + strerror(error));
  }
  std::string password(line.data());
  const WipeOnExit wipe_password(password);
  explicit_bzero(line.data(), line.size());
  if (password.size() + 1 == line.size()) {
    return failure("the password is too long to be typed; give it through a pipe");
  }
  return checked(password);
}

}  // namespace

PasswordInput read_password_line(int fd) {
  std::string line;
  line.reserve(kMaxPasswordBytes);  // no copies of a growing string are left behind
  const WipeOnExit wipe_line(line);
  for (;;) {
    char character = 0;
    const ssize_t count = TEMP_FAILURE_RETRY(read(fd, &character, 1));
    if (count < 0) {
      return failure(std::string("cannot read the password: ") + strerror(errno));
    }
    if (count == 0 && line.empty()) {
      return failure("no password on standard input");
    }
    if (count == 0 || character == '\n') {
      return checked(line);
    }
    if (line.size() == kMaxPasswordBytes) {
      return failure("the password is longer than 65536 bytes");
    }
    line.push_back(character);
  }
}

PasswordInput read_password(const char* prompt) {
  return isatty(STDIN_FILENO) != 0 ? ask_on_terminal(prompt) : read_password_line(STDIN_FILENO);
}

}  // namespace sentrova
