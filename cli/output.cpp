#include "cli/output.h"

#include <cstdio>
#include <nlohmann/json.hpp>

namespace sentrova {
namespace {

// What is not UTF-8, as a device's name may be, is shown by replacement characters.
std::string one_line(const nlohmann::json& object) {
  return object.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
}

}  // namespace

void Output::result(const std::string& text, const nlohmann::json& object) const {
  printf("%s\n", json_ ? one_line(object).c_str() : text.c_str());
}

void Output::error(const std::string& text) const {
  error(text, nlohmann::json::object());
}

void Output::error(const std::string& text, const nlohmann::json& object) const {
  fprintf(stderr, "sentrova: %s\n", text.c_str());
  if (json_) {
    nlohmann::json with_error = object;
    with_error["error"] = text;
    printf("%s\n", one_line(with_error).c_str());
  }
}

void Output::progress(const std::string& text) const {
  if (!json_) {
    fputs(text.c_str(), stdout);
    fflush(stdout);
  }
}

}  // namespace sentrova
