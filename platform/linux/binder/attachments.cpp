#include "platform/linux/binder/attachments.h"

#include <algorithm>

namespace sentrova::binder {

Attachments::~Attachments() {
  for (const Entry& entry : entries_) {
    if (entry.cleanup != nullptr)
      entry.cleanup(entry.id, entry.object, entry.cookie);
  }
}

std::vector<Attachments::Entry>::const_iterator Attachments::position_of(const void* id) const {
  return std::find_if(entries_.begin(), entries_.end(),
                      [id](const Entry& entry) { return entry.id == id; });
}

void Attachments::attach(const void* id, void* object, void* cookie,
                         android::IBinder::object_cleanup_func cleanup) {
  const std::lock_guard guard(lock_);
  if (position_of(id) == entries_.end())
    entries_.push_back({id, object, cookie, cleanup});
}

void* Attachments::find(const void* id) const {
  const std::lock_guard guard(lock_);
  const auto found = position_of(id);
  return found == entries_.end() ? nullptr : found->object;
}

void Attachments::detach(const void* id) {
  const std::lock_guard guard(lock_);
  const auto found = position_of(id);
  if (found != entries_.end())
    entries_.erase(found);
}

}  // namespace sentrova::binder
