#pragma once

#include <android-base/logging.h>

#include <cerrno>
#include <string_view>

namespace sentrova {

// A place in the sources as a log line shows it. Field tools key on these positions, so a message
// keeps its position wherever the code that prints it stands.
struct LogPosition {
  const char* file;
  unsigned int line;
};

namespace internal {
inline void write_log_line(LogPosition position, android::base::LogSeverity severity, int error,
                           std::string_view text) {
  const int saved_errno = errno;
  if (android::base::ShouldLog(severity, nullptr)) {
    android::base::LogMessage(position.file, position.line, severity, nullptr, error).stream()
        << text;
  }
  errno = saved_errno;
}
}  // namespace internal

// Writes one line to the platform's base log with the given position, if the severity passes the
// platform's filter. Keeps `errno`. FATAL aborts the process.
inline void log_at(LogPosition position, android::base::LogSeverity severity,
                   std::string_view text) {
  internal::write_log_line(position, severity, -1, text);
}

// As log_at, with ": " and the text of the current `errno` appended.
inline void plog_at(LogPosition position, android::base::LogSeverity severity,
                    std::string_view text) {
  internal::write_log_line(position, severity, errno, text);
}

}  // namespace sentrova
