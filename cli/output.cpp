#include "cli/output.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <cstdio>
#include <nlohmann/json.hpp>

#include "cli/printable.h"

namespace sentrova {
namespace {

// What is not UTF-8, as a device's name may be, is shown by replacement characters.
std::string one_line(const nlohmann::json& object) {
  return object.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
}

size_t terminal_width() {
  constexpr size_t kUsualWidth = 80;  // of a console that does not tell
  winsize size = {};
  return ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 0 ? size.ws_col
                                                                         : kUsualWidth;
}

}  // namespace

void Output::result(const std::string& text, const nlohmann::json& object) const {
  printf("%s\n", json_ ? one_line(object).c_str() : text.c_str());
}

void Output::result(const Table& table, const nlohmann::json& object) const {
  const std::string text = to_terminal() ? table.aligned(terminal_width()) : table.tab_separated();
  if (json_ || !text.empty()) {
    result(text, object);
  }
}

void Output::error(const std::string& text) const {
  error(text, nlohmann::json::object());
}

void Output::error(const std::string& text, const nlohmann::json& object) const {
  note(text);
  if (json_) {
    nlohmann::json with_error = object;
    with_error["error"] = text;
    printf("%s\n", one_line(with_error).c_str());
  }
}

void Output::note(const std::string& text) const {
  fprintf(stderr, "sentrova: %s\n", printable(text).c_str());
}

bool Output::to_terminal() const {
  return !json_ && isatty(STDOUT_FILENO) != 0;
}

void Output::progress(const std::string& text) const {
  if (!json_) {
    fputs(text.c_str(), stdout);
    fflush(stdout);
  }
}

}  // namespace sentrova
