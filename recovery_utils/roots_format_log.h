#pragma once

#include <string_view>

#include "common/log_at.h"

// The base log as the formatting of volumes writes it, one line a call, with its position in the
// roots unit.
namespace sentrova::format_log {

inline LogPosition at(unsigned int line) {
  return {"recovery_utils/roots.cpp", line};
}

inline void info(unsigned int line, std::string_view text) {
  log_at(at(line), android::base::INFO, text);
}

inline void error(unsigned int line, std::string_view text) {
  log_at(at(line), android::base::ERROR, text);
}

// With the text of the current `errno`.
inline void system_error(unsigned int line, std::string_view text) {
  plog_at(at(line), android::base::ERROR, text);
}

}  // namespace sentrova::format_log
