#pragma once

#include <android-base/unique_fd.h>

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "common/export.h"

namespace sentrova {

// Returns the folder of the shared property store: the environment variable ANDROID_PROPERTY_DIR,
// else /dev/__properties__. The variable is read at every call, so that a test may point each case
// at a folder of its own; like any change of the environment, set it while one thread runs. Where
// the folder does not exist, SetProperty and GetProperty keep to a store of the process's own.
SENTROVA_API std::string property_directory();

// What a watcher saw.
struct PropertyChanges {
  // The properties that were set or removed, each once, in the order in which they first changed.
  std::vector<std::string> names;
  // Changes were lost because they came faster than they were read: any property may have changed.
  bool rescan = false;
};

// Watches the shared property store. Changes are kept from the creation on, so one that creates the
// watcher first and reads the properties then misses none. It tells names, not values: of values
// that were set in quick succession a later GetProperty shows the last. One thread at a time.
class SENTROVA_API PropertyWatcher {
 public:
  // Starts to watch `directory`. Returns nothing, with `errno`, where there is no such folder or no
  // watch is to be had.
  static std::optional<PropertyWatcher> create(const std::string& directory = property_directory());

  // Returns the descriptor that becomes readable when there are changes, for poll(2). It stays the
  // watcher's own.
  int fd() const { return fd_.get(); }

  // Waits for changes for at most `timeout` (zero: does not wait; negative: without limit). Returns
  // what changed; no names and no rescan on time-out, after a signal, or where the only change was
  // no property's. Returns nothing, with `errno`, when watching is over: ENOENT where the folder
  // itself was removed or renamed.
  std::optional<PropertyChanges> wait(std::chrono::milliseconds timeout);

 private:
  explicit PropertyWatcher(android::base::unique_fd fd) : fd_(std::move(fd)) {}

  android::base::unique_fd fd_;
};

}  // namespace sentrova
