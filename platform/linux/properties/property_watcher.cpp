#include "platform/linux/properties/property_watcher.h"

#include <poll.h>
#include <stdlib.h>
#include <string.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <limits>
#include <string_view>
#include <utility>

#include "platform/linux/properties/property_rules.h"

namespace sentrova {
namespace {

using android::base::unique_fd;

// A "ro." property appears by link (IN_CREATE), any other by rename (IN_MOVED_TO); IN_CLOSE_WRITE
// is for files written by hand.
constexpr uint32_t kEvents = IN_CREATE | IN_MOVED_TO | IN_CLOSE_WRITE | IN_DELETE | IN_DELETE_SELF |
                             IN_MOVE_SELF | IN_ONLYDIR;
constexpr uint32_t kFolderGone = IN_DELETE_SELF | IN_MOVE_SELF | IN_UNMOUNT | IN_IGNORED;

// Adds the events of one read to `changes`. Returns false if one says that the folder is gone.
bool add_events(std::string_view events, PropertyChanges& changes) {
  while (events.size() >= sizeof(inotify_event)) {
    inotify_event event = {};
    memcpy(&event, events.data(), sizeof(event));
    events.remove_prefix(sizeof(event));
    if ((event.mask & kFolderGone) != 0 || event.len > events.size()) {
      return false;
    }
    // The name is padded with NULs up to event.len.
    const std::string_view field = events.substr(0, event.len);
    const std::string name(field.substr(0, field.find('\0')));
    events.remove_prefix(event.len);
    changes.rescan = changes.rescan || (event.mask & IN_Q_OVERFLOW) != 0;
    if (is_property_name(name) &&
        std::find(changes.names.begin(), changes.names.end(), name) == changes.names.end()) {
      changes.names.push_back(name);
    }
  }
  return true;
}

int poll_timeout_milliseconds(std::chrono::milliseconds timeout) {
  return static_cast<int>(std::clamp<std::chrono::milliseconds::rep>(
      timeout.count(), -1, std::numeric_limits<int>::max()));
}

}  // namespace

std::string property_directory() {
  const char* const directory = secure_getenv("ANDROID_PROPERTY_DIR");
  return directory != nullptr && *directory != '\0' ? directory : "/dev/__properties__";
}

std::optional<PropertyWatcher> PropertyWatcher::create(const std::string& directory) {
  unique_fd fd(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  if (!fd.ok() || inotify_add_watch(fd.get(), directory.c_str(), kEvents) < 0) {
    return std::nullopt;
  }
  return PropertyWatcher(std::move(fd));
}

std::optional<PropertyChanges> PropertyWatcher::wait(std::chrono::milliseconds timeout) {
  pollfd waiting = {.fd = fd_.get(), .events = POLLIN, .revents = 0};
  if (poll(&waiting, 1, poll_timeout_milliseconds(timeout)) < 0 && errno != EINTR) {
    return std::nullopt;
  }
  // Room for a few dozen events of the longest names; the rest stays for the next call.
  std::array<char, 16384> events;
  const ssize_t length = read(fd_.get(), events.data(), events.size());
  PropertyChanges changes;
  if (length < 0) {
    return errno == EAGAIN || errno == EINTR ? std::optional(changes) : std::nullopt;
  }
  if (!add_events({events.data(), static_cast<size_t>(length)}, changes)) {
    errno = ENOENT;
    return std::nullopt;
  }
  return changes;
}

}  // namespace sentrova
