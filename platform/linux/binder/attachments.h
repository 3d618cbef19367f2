#pragma once

#include <mutex>
#include <vector>

#include "binder/IBinder.h"

namespace sentrova::binder {

// What users keep with a binder object, by identity. Safe on all threads; whoever destroys it must
// be the last user. Clean-up functions run at destruction.
class Attachments {
 public:
  Attachments() = default;
  ~Attachments();
  Attachments(const Attachments&) = delete;
  Attachments& operator=(const Attachments&) = delete;

  // Does nothing if `id` is taken.
  void attach(const void* id, void* object, void* cookie,
              android::IBinder::object_cleanup_func cleanup);
  // Null if there is none.
  void* find(const void* id) const;
  // Does nothing if there is none.
  void detach(const void* id);

 private:
  struct Entry {
    const void* id;
    void* object;
    void* cookie;
    android::IBinder::object_cleanup_func cleanup;
  };

  std::vector<Entry>::const_iterator position_of(const void* id) const;

  mutable std::mutex lock_;
  std::vector<Entry> entries_;
};

}  // namespace sentrova::binder
