#include "cli/output.h"

#include <cstdio>
#include <nlohmann/json.hpp>

namespace sentrova {

void Output::result(const std::string& text, const nlohmann::json& object) const {
  printf("%s\n", json_ ? object.dump().c_str() : text.c_str());
}

void Output::error(const std::string& text) const {
  fprintf(stderr, "sentrova: %s\n", text.c_str());
  if (json_) {
    printf("%s\n", nlohmann::json({{"error", text}}).dump().c_str());
  }
}

}  // namespace sentrova
