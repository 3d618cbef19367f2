#include "cli/progress.h"

#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <mutex>

namespace sentrova {
namespace {

// Of a terminal (ECMA-48, and VT100 for the cursor).
constexpr char kSaveCursor[] = "\0337";
constexpr char kRestoreCursor[] = "\0338";
constexpr char kClearToLineEnd[] = "\033[K";

void write_to_terminal(const std::string& text) {
  // Nobody could be told of a failure.
  static_cast<void>(!write(STDERR_FILENO, text.data(), text.size()));
}

void show_seconds(const std::stop_token& stop, const std::string& what) {
  std::mutex mutex;
  std::unique_lock lock(mutex);
  std::condition_variable_any wake;
  int seconds = 0;
  while (!wake.wait_for(lock, stop, std::chrono::seconds(1),
                        [&stop] { return stop.stop_requested(); })) {
    write_to_terminal(kSaveCursor + what + (what.empty() ? "" : ": ") + std::to_string(++seconds) +
                      " s" + kClearToLineEnd + kRestoreCursor);
  }
  if (seconds > 0) {
    write_to_terminal(kClearToLineEnd);
  }
}

}  // namespace

Progress::Progress(const std::string& what) {
  if (isatty(STDERR_FILENO) != 0) {
    thread_ = std::jthread([what](const std::stop_token& stop) { show_seconds(stop, what); });
  }
}

// The thread's own end stops it and waits for it.
Progress::~Progress() = default;

}  // namespace sentrova
