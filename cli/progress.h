#pragma once

#include <string>
#include <thread>

namespace sentrova {

// While one is alive and after a second, a terminal at standard error shows what is being done and
// for how long, behind the cursor, which stays where it is; so what others write meanwhile stands
// in its place. It is cleared at the end. Without a terminal nothing is shown. One at a time.
class Progress {
 public:
  // `what` is short and may be empty, where the line already tells it.
  explicit Progress(const std::string& what);
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

 private:
  std::jthread thread_;
};

}  // namespace sentrova
